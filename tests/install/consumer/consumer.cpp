// Binds annotation state to a toolkit document and frees it again, through the
// installed headers and libraries only.
#include <anno/anno.h>
#include <anno/toolkit.h>

#include <cstdio>
#include <string>

int main() {
    std::string error;
    DAHandle doc = antk::loadText("A paragraph.\n\nAnother one.\n", &error);
    if (doc == nullptr) {
        std::fprintf(stderr, "consumer: cannot load the text: %s\n", error.c_str());
        return 1;
    }
    const uint32_t init = ANInit(doc, nullptr, nullptr, nullptr);
    const bool bound = antk::annoSlot(doc) != nullptr;
    const uint32_t deinit = ANDeInit(doc);
    const bool released = antk::annoSlot(doc) == nullptr;
    antk::destroyDocument(doc);
    if (init != AN_OK || !bound || deinit != AN_OK || !released) {
        std::fprintf(stderr, "consumer: ANInit %u (bound %d), ANDeInit %u (released %d)\n", init,
                     bound, deinit, released);
        return 1;
    }
    std::printf("consumer: annotation state made and freed\n");
    return 0;
}
