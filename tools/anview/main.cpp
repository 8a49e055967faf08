// anview: draws a text document with its annotations through the annotation library.
// Bad input ends it with one line on standard error and exit status 2.
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "annotations.h"
#include "failure.h"
#include "options.h"
#include "render.h"
#include "sample.h"
#include "session.h"

namespace {

constexpr int kBadInput = 2;

std::string readFile(const std::string &path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        throw anview::Failure(path + ": cannot open the file");
    }
    std::string bytes;
    try {
        bytes.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    } catch (const std::exception &) {
        in.setstate(std::ios::badbit);  // a directory, or a read error
    }
    if (in.bad()) {
        throw anview::Failure(path + ": cannot read the file");
    }
    return bytes;
}

// Colour codes only for a terminal, and not when NO_COLOR asks for none.
bool colourTerminal() {
    const char *noColour = std::getenv("NO_COLOR");
    return isatty(STDOUT_FILENO) == 1 && (noColour == nullptr || noColour[0] == '\0');
}

int run(const std::vector<std::string> &args) {
    using namespace anview;
    const Options options = parseOptions(args);
    if (options.help) {
        std::cout << kUsage;
        return 0;
    }

    AnnotationSet set;
    std::string source;
    if (options.annotations) {
        source = *options.annotations;
        set = parseAnnotations(readFile(source), source);
    } else if (!options.document) {
        source = "built-in sample annotations";
        set = parseAnnotations(kSampleAnnotations, source);
    }

    const std::string title = options.document ? *options.document : "built-in sample";
    const auto session = std::make_unique<Session>(options.document.value_or(""),
                                                   options.document ? "" : kSampleText, title);
    session->add(set, source);
    Page page = session->draw(set, title);
    if (!options.hover.empty()) {
        page.hover = session->hover(options.hover, set);
        page.hoverAsked = true;
    }

    if (options.html) {
        std::ostringstream html;
        renderHtml(page, html);
        if (*options.html == "-") {
            std::cout << html.str();
        } else {
            std::ofstream out(*options.html, std::ios::binary);
            out << html.str();
            out.close();
            if (!out) {
                throw Failure(*options.html + ": cannot write the file");
            }
        }
    } else {
        renderTerminal(page, std::cout, options.width, colourTerminal());
    }
    std::cout.flush();
    if (!std::cout) {
        throw Failure("cannot write to standard output");
    }
    return 0;
}

}  // namespace

int main(int argc, char **argv) {
    try {
        return run(std::vector<std::string>(argv + 1, argv + argc));
    } catch (const anview::Failure &failure) {
        std::cerr << "anview: " << failure.what() << '\n';
    } catch (const std::exception &e) {
        std::cerr << "anview: " << e.what() << '\n';
    }
    return kBadInput;
}
