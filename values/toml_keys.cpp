#include "values/toml_keys.h"

#include <algorithm>
#include <string>

namespace pinwell::values {
namespace {

class KeyScan {
  public:
    KeyScan(std::string_view document, unsigned parts) : rest_(document), parts_(parts) {}

    /// The line of the first one; `nullopt` if there is none.
    std::optional<unsigned> run() {
        while (!rest_.empty()) {
            const char c = rest_.front();
            if (c == '"' || c == '\'') {
                if (!skipString(c)) return std::nullopt;
                continue;
            }
            if (c == '#') {
                rest_.remove_prefix(std::min(rest_.find('\n'), rest_.size()));
                continue;
            }
            if (c == '.' && ++dots_ == parts_) return line_;
            if (std::string_view("\n=,[]{}").find(c) != std::string_view::npos) dots_ = 0;
            if (c == '\n') ++line_;
            rest_.remove_prefix(1);
        }
        return std::nullopt;
    }

  private:
    /// Returns false if it is unterminated.
    bool skipString(char quote) {
        const std::string three(3, quote);
        const bool isLong = rest_.starts_with(three);
        rest_.remove_prefix(isLong ? 3 : 1);
        while (!rest_.empty()) {
            const char c = rest_.front();
            if (isLong ? rest_.starts_with(three) : c == quote) {
                rest_.remove_prefix(isLong ? 3 : 1);
                // Up to two more quotes belong to a long string.
                for (int i = 0; isLong && i < 2 && rest_.starts_with(quote); ++i) rest_.remove_prefix(1);
                return true;
            }
            if (c == '\n' && !isLong) return false;
            const bool isEscape = c == '\\' && quote == '"' && rest_.size() > 1;
            if (rest_[isEscape ? 1 : 0] == '\n') ++line_;
            rest_.remove_prefix(isEscape ? 2 : 1);
        }
        return false;
    }

    std::string_view rest_;
    const unsigned parts_;
    unsigned line_ = 1;
    unsigned dots_ = 0;
};

}  // namespace

std::optional<unsigned> lineOfLongTomlKey(std::string_view document, unsigned parts) {
    return KeyScan(document, parts).run();
}

}  // namespace pinwell::values
