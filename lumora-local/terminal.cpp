#include "lumora-local/terminal.h"

#include "lumora-local/failure.h"

namespace pinwell::lumora {

void writeLine(std::FILE* stream, std::string_view line) {
    const std::string text = std::string(line) + "\n";
    std::fwrite(text.data(), 1, text.size(), stream);
    std::fflush(stream);
}

void writeText(const std::string& text) {
    const bool written = std::fwrite(text.data(), 1, text.size(), stdout) == text.size();
    if (!written || std::fflush(stdout) != 0) throw Failure(EX_IOERR, "cannot write to standard output");
}

void writePart(std::string_view text) {
    if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size()) {
        throw Failure(EX_IOERR, "cannot write to standard output");
    }
}

void complain(std::string_view text) {
    writeLine(stderr, "lumora-local: " + std::string(text));
}

}  // namespace pinwell::lumora
