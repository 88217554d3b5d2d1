#include "requirement.h"

#include <algorithm>
#include <string>

#include "base/text.h"

namespace pinwell::verify {

namespace {

constexpr unsigned kMaximumDepth = 64;

struct Token {
    enum class Kind { end, word, text, data, open, close, negation, other };

    Kind kind = Kind::end;
    std::string_view value;
};

bool isBlank(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\r';
}

bool isWordCharacter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' ||
           c == '-' || c == '_';
}

Satisfied negated(Satisfied value) {
    if (value == Satisfied::unknown) return value;
    return value == Satisfied::yes ? Satisfied::no : Satisfied::yes;
}

class Evaluation {
  public:
    Evaluation(const CodeIdentity& code, std::string_view text) : code_(code), rest_(text) { next(); }

    Satisfied run() {
        // A leading "designated =>" names the kind of the requirement.
        if (isWord("designated") || isWord("host") || isWord("guest")) {
            next();
            while (token_.kind == Token::Kind::other) next();
        }
        const Satisfied value = disjunction(0);
        return token_.kind == Token::Kind::end && !isBroken_ ? value : Satisfied::unknown;
    }

  private:
    bool isWord(std::string_view word) const {
        return token_.kind == Token::Kind::word && token_.value == word;
    }

    void next() {
        while (!rest_.empty() && isBlank(rest_.front())) rest_.remove_prefix(1);
        if (rest_.empty()) {
            token_ = {};
            return;
        }
        const char first = rest_.front();
        if (first == '"') return quoted(Token::Kind::text, 1);
        if (first == 'H' && rest_.size() > 1 && rest_[1] == '"') return quoted(Token::Kind::data, 2);
        std::size_t length = 0;
        while (length < rest_.size() && isWordCharacter(rest_[length])) ++length;
        Token::Kind kind = Token::Kind::word;
        if (length == 0) {
            length = 1;
            kind = first == '('   ? Token::Kind::open
                   : first == ')' ? Token::Kind::close
                   : first == '!' ? Token::Kind::negation
                                  : Token::Kind::other;
        }
        token_ = {kind, rest_.substr(0, length)};
        rest_.remove_prefix(length);
    }

    void quoted(Token::Kind kind, std::size_t opening) {
        const std::size_t end = rest_.find('"', opening);
        isBroken_ = isBroken_ || end == std::string_view::npos ||
                    rest_.substr(opening, end - opening).find('\\') != std::string_view::npos;
        if (end == std::string_view::npos) {
            token_ = {};
            rest_ = {};
            return;
        }
        token_ = {kind, rest_.substr(opening, end - opening)};
        rest_.remove_prefix(end + 1);
    }

    Satisfied disjunction(unsigned depth) {
        Satisfied value = conjunction(depth);
        while (isWord("or")) {
            next();
            value = std::max(value, conjunction(depth));
        }
        return value;
    }

    Satisfied conjunction(unsigned depth) {
        Satisfied value = unary(depth);
        while (isWord("and")) {
            next();
            value = std::min(value, unary(depth));
        }
        return value;
    }

    Satisfied unary(unsigned depth) {
        if (depth > kMaximumDepth) {
            isBroken_ = true;
            return Satisfied::unknown;
        }
        if (token_.kind == Token::Kind::negation) {
            next();
            return negated(unary(depth + 1));
        }
        if (token_.kind == Token::Kind::open) {
            next();
            const Satisfied value = disjunction(depth + 1);
            if (token_.kind != Token::Kind::close) isBroken_ = true;
            next();
            return value;
        }
        return primary();
    }

    Satisfied primary() {
        if (isWord("always") || isWord("true") || isWord("never") || isWord("false")) {
            const bool isTrue = isWord("always") || isWord("true");
            next();
            return isTrue ? Satisfied::yes : Satisfied::no;
        }
        if (isWord("identifier")) {
            next();
            if (token_.kind == Token::Kind::other && token_.value == "=") next();
            const bool isSame = token_.value == code_.identifier;
            if (token_.kind != Token::Kind::text && token_.kind != Token::Kind::word) isBroken_ = true;
            next();
            return isSame ? Satisfied::yes : Satisfied::no;
        }
        if (isWord("cdhash")) {
            next();
            const std::string wanted(token_.value);
            if (token_.kind != Token::Kind::data) isBroken_ = true;
            next();
            return isOneOfTheHashes(wanted) ? Satisfied::yes : Satisfied::no;
        }
        return passOver();
    }

    bool isOneOfTheHashes(std::string wanted) const {
        std::transform(wanted.begin(), wanted.end(), wanted.begin(),
                       [](char c) { return c >= 'A' && c <= 'F' ? static_cast<char>(c - 'A' + 'a') : c; });
        return std::any_of(code_.codeHashes.begin(), code_.codeHashes.end(),
                           [&](const Data& hash) { return base::toHex(hash) == wanted; });
    }

    // Skips an unsupported condition, up to the next one.
    Satisfied passOver() {
        bool isEmpty = true;
        while (token_.kind != Token::Kind::end && token_.kind != Token::Kind::close &&
               token_.kind != Token::Kind::open && !isWord("and") && !isWord("or")) {
            next();
            isEmpty = false;
        }
        if (isEmpty) isBroken_ = true;
        return Satisfied::unknown;
    }

    const CodeIdentity& code_;
    std::string_view rest_;
    Token token_;
    bool isBroken_ = false;
};

}  // namespace

Satisfied satisfies(const CodeIdentity& code, std::string_view requirement) {
    return Evaluation(code, requirement).run();
}

}  // namespace pinwell::verify
