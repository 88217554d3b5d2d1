// XML documents, event by event: the only way from input to the XML library.
//
// The library works in linear time as long as a document declares nothing and what it must see whole (a tag,
// a comment, a processing instruction) is short against the pieces that it is given; and it remembers every
// distinct name. So it gets pieces of this file's choosing, and a fixed amount of memory.
//
// Encodings: UTF-8, ISO-8859-1 or US-ASCII, as declared; UTF-8 without a declaration. Every text comes out in
// UTF-8. Names come as they are written: name spaces are not looked at, and their declarations are
// attributes.
//
// Refused: what is not well-formed; another encoding, and a byte order mark of UTF-8 before the declaration
// of another; a document type, or one with declarations inside, as the caller wishes; references to entities
// other than the five that need no declaration; and what needs more than kMaximumXMLMemory. Nothing but the
// document is ever read.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::foundation {

/// What the library may allocate for one document: names, and twice the longest tag or comment.
inline constexpr std::size_t kMaximumXMLMemory = 4 * 1024 * 1024;

/// The document is refused. Ends the parse.
class MalformedXML : public std::runtime_error {
  public:
    MalformedXML(std::uint64_t offset, const std::string& what) : std::runtime_error(what), offset_(offset) {}

    /// In bytes from the start of the document.
    std::uint64_t offset() const noexcept { return offset_; }

  private:
    std::uint64_t offset_;
};

/// The attributes of one element. Valid during the event.
class XMLAttributes {
  public:
    /// Names and values by turns, as the library lays them out, and a null pointer at the end.
    explicit XMLAttributes(const char* const* words) : words_(words) {}

    /// `nullopt` if there is none of that name.
    std::optional<std::string_view> operator[](std::string_view name) const;

  private:
    const char* const* words_;
};

/// What a document is made of, in its order. What an event throws ends the parse and comes out of it.
class XMLEvents {
  public:
    virtual ~XMLEvents() = default;

    virtual void begin(std::string_view name, const XMLAttributes& attributes) = 0;
    virtual void end(std::string_view name) = 0;

    /// A piece of character data; one text may come in several, and marked sections are not told apart.
    virtual void text(std::string_view piece) = 0;
};

/// Reads one document. After an exception it must not be used again. Throws MalformedXML, std::bad_alloc and
/// what the events throw.
class XMLParser {
  public:
    enum class DocumentType { refused, withoutDeclarations };

    /// `events` must outlive the parser.
    XMLParser(XMLEvents& events, DocumentType documentType);
    ~XMLParser();
    XMLParser(const XMLParser&) = delete;
    XMLParser& operator=(const XMLParser&) = delete;

    void feed(ByteView bytes);

    /// Once, and last.
    void finish();

    /// Where the event that goes on began, in bytes from the start of the document.
    std::uint64_t offset() const;

  private:
    class Library;

    std::unique_ptr<Library> library_;
};

}  // namespace pinwell::foundation
