#include "failure.h"

#include "anno/anno.h"

namespace anview {

std::string describeResult(uint32_t code) {
    std::string text = "code " + std::to_string(code);
    switch (code) {
        case AN_ERR_NOMEM:
            return text + " (out of memory, or the annotation table is full)";
        case AN_ERR_BADARG:
            return text + " (a bad argument)";
        case AN_ERR_NOSTATE:
            return text + " (the document has no annotation state)";
        case AN_ERR_NOTFOUND:
            return text + " (nothing found)";
        default:
            return text + " (a failure of the toolkit's modules)";
    }
}

}  // namespace anview
