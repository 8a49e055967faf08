#include "options.h"

#include <charconv>

#include "failure.h"

namespace anview {

const char *const kUsage =
    "usage: anview [DOCUMENT] [--annotations FILE] [--html OUT] [--hover OFFSET ...] "
    "[--width N]\n"
    "\n"
    "Draws a UTF-8 text document with its annotations, then a legend of them.\n"
    "Without DOCUMENT, a built-in sample document with its own annotations.\n"
    "\n"
    "  --annotations FILE  annotations and styles to add, as JSON\n"
    "  --html OUT          write the drawing as an HTML page to OUT (- for standard output)\n"
    "  --hover OFFSET ...  move the pointer to these character offsets, one after another,\n"
    "                      and print the enter and leave events\n"
    "  --width N           wrap terminal lines at N columns (20 to 1000, default 80)\n"
    "  --help              show this text\n";

namespace {

bool parseNumber(const std::string &text, uint32_t &value) {
    if (text.empty() || text[0] < '0' || text[0] > '9') {
        return false;
    }
    const char *end = text.data() + text.size();
    const auto [ptr, ec] = std::from_chars(text.data(), end, value);
    return ec == std::errc() && ptr == end;
}

bool looksLikeNumber(const std::string &text) {
    return !text.empty() && text.find_first_not_of("0123456789") == std::string::npos;
}

}  // namespace

Options parseOptions(const std::vector<std::string> &args) {
    Options options;
    for (std::size_t i = 0; i < args.size(); ++i) {
        std::string arg = args[i];
        std::optional<std::string> inlineValue;
        if (arg.rfind("--", 0) == 0) {
            const auto eq = arg.find('=');
            if (eq != std::string::npos) {
                inlineValue = arg.substr(eq + 1);
                arg.resize(eq);
            }
        }
        // The value of an option that takes one: after '=' or in the next argument.
        auto value = [&](const char *what) {
            if (inlineValue) {
                return *inlineValue;
            }
            if (i + 1 >= args.size()) {
                throw Failure(arg + " needs " + what);
            }
            return args[++i];
        };
        auto once = [&](std::optional<std::string> &slot, const char *what) {
            if (slot) {
                throw Failure(arg + " given twice");
            }
            slot = value(what);
        };

        if (arg == "--help" || arg == "-h") {
            options.help = true;
        } else if (arg == "--annotations") {
            once(options.annotations, "a file name");
        } else if (arg == "--html") {
            once(options.html, "a file name (or - for standard output)");
        } else if (arg == "--width") {
            const std::string text = value("a number");
            uint32_t width = 0;
            if (!parseNumber(text, width) || width < kMinWidth || width > kMaxWidth) {
                throw Failure("--width: expected a number from " + std::to_string(kMinWidth) +
                              " to " + std::to_string(kMaxWidth) + ", got \"" + text + "\"");
            }
            options.width = width;
        } else if (arg == "--hover") {
            std::vector<std::string> texts;
            if (inlineValue) {
                texts.push_back(*inlineValue);
            }
            while (i + 1 < args.size() && looksLikeNumber(args[i + 1])) {
                texts.push_back(args[++i]);
            }
            if (texts.empty()) {
                throw Failure("--hover needs at least one character offset");
            }
            for (const std::string &text : texts) {
                uint32_t offset = 0;
                if (!parseNumber(text, offset)) {
                    throw Failure("--hover: \"" + text + "\" is not a character offset");
                }
                options.hover.push_back(offset);
            }
        } else if (arg.size() > 1 && arg[0] == '-') {
            throw Failure("unknown option \"" + arg + "\" (see anview --help)");
        } else if (options.document) {
            throw Failure("more than one document given (\"" + *options.document + "\" and \"" +
                          arg + "\")");
        } else {
            options.document = arg;
        }
    }
    return options;
}

}  // namespace anview
