// What every part of anview throws when it cannot go on: a one-line message that names
// the problem (the file, the annotation, the option), printed as "anview: <message>".
#ifndef ANVIEW_FAILURE_H
#define ANVIEW_FAILURE_H

#include <cstdint>
#include <stdexcept>
#include <string>

namespace anview {

struct Failure : std::runtime_error {
    using std::runtime_error::runtime_error;
};

// "code 13 (out of memory or the annotation table is full)" for a library result code.
std::string describeResult(uint32_t code);

}  // namespace anview

#endif  // ANVIEW_FAILURE_H
