// The command line of anview.
#ifndef ANVIEW_OPTIONS_H
#define ANVIEW_OPTIONS_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace anview {

struct Options {
    std::optional<std::string> document;     // none: the built-in sample
    std::optional<std::string> annotations;  // none: no annotations (sample: its own)
    std::optional<std::string> html;         // "-" is standard output
    std::vector<uint32_t> hover;             // character offsets, in the order given
    uint32_t width = 80;
    bool help = false;
};

constexpr uint32_t kMinWidth = 20;
constexpr uint32_t kMaxWidth = 1000;

// Reads the arguments after the program name. Throws Failure with a one-line message.
Options parseOptions(const std::vector<std::string> &args);

extern const char *const kUsage;

}  // namespace anview

#endif  // ANVIEW_OPTIONS_H
