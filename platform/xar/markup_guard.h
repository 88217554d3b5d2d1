// Looks at a table of contents before the XML parser does. For this folder only.
//
// The parser's own limits leave room for what costs it time out of proportion: it compares every attribute of
// an element with every other one, and goes over an unfinished tag again with each piece that arrives. And it
// reads document types, which no archive needs. So the markup, and only the markup, is walked here first.
//
// Refused: document types and all else that begins with "<!" other than comments and marked sections; a zero
// byte, and a first character that is neither '<' nor white space nor UTF-8's byte order mark, which leaves
// UTF-8 as the only encoding;
// '<' inside a tag; and what passes a limit below.
#pragma once

#include <cstdint>
#include <string>

#include "foundation/bytes.h"

namespace pinwell::xar {

/// Attributes of one element, namespace declarations among them.
inline constexpr unsigned kMaximumAttributes = 64;

/// Longest tag, comment, processing instruction or marked section, in bytes.
inline constexpr std::size_t kMaximumMarkup = std::size_t{64} * 1024;

class MarkupGuard {
  public:
    /// The next bytes of the document. False once something was refused, and from then on.
    bool feed(foundation::ByteView bytes);

  private:
    enum class State { start, text, opening, tag, quoted, comment, instruction, section, refused };

    State next(char c);
    State opening();
    State inTag(char c);

    State state_ = State::start;
    std::string markup_;  // the current piece's first characters, as many as tell what it is
    std::string tail_;    // its last ones, as many as can end it
    std::size_t length_ =
        0;  // of the current piece; before the first one, of what there is of a byte order mark
    unsigned attributes_ = 0;
    char quote_ = '\0';
};

}  // namespace pinwell::xar
