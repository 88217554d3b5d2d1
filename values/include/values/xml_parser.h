// XML documents, event by event: the only use of the XML library on input.
//
// The library works in linear time under two conditions. The document declares nothing, and each unit (a tag,
// a comment, a processing instruction) is short compared with the pieces of input. It also remembers every
// distinct name. So this file chooses the pieces, and gives the library a fixed amount of memory.
//
// Encodings: UTF-8, ISO-8859-1 or US-ASCII, as declared; UTF-8 without a declaration. Every text is passed
// on in UTF-8. Names are passed on as written: name spaces are ignored, and their declarations are
// attributes.
//
// Refused: documents that are not well-formed; another encoding, and a UTF-8 byte order mark before the
// declaration of another; a document type, or one with declarations inside, as the caller chooses; references
// to entities other than the five predefined ones; and documents that need more than kMaximumXMLMemory.
// Nothing outside the document is ever read.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>

#include "base/bytes.h"

namespace pinwell::values {

/// Memory limit of the library for one document: names, and twice the longest tag or comment.
inline constexpr std::size_t kMaximumXMLMemory = 4 * 1024 * 1024;

/// Thrown for a refused document. Ends the parse.
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
    /// Alternating names and values, as the library passes them, and a null pointer at the end.
    explicit XMLAttributes(const char* const* words) : words_(words) {}

    /// `nullopt` if there is no attribute of that name.
    std::optional<std::string_view> operator[](std::string_view name) const;

  private:
    const char* const* words_;
};

/// The parts of a document, in its order. An exception of an event ends the parse and passes through it.
class XMLEvents {
  public:
    virtual ~XMLEvents() = default;

    virtual void begin(std::string_view name, const XMLAttributes& attributes) = 0;
    virtual void end(std::string_view name) = 0;

    /// A piece of character data. One text may come in several pieces; marked sections look the same.
    virtual void text(std::string_view piece) = 0;
};

/// Reads one document. After an exception it must not be used again. Throws MalformedXML, std::bad_alloc and
/// the events' exceptions.
class XMLParser {
  public:
    enum class DocumentType { refused, withoutDeclarations };

    /// `events` must outlive the parser.
    XMLParser(XMLEvents& events, DocumentType documentType);
    ~XMLParser();
    XMLParser(const XMLParser&) = delete;
    XMLParser& operator=(const XMLParser&) = delete;

    void feed(base::ByteView bytes);

    /// Call it once, and last.
    void finish();

    /// The start of the current event, in bytes from the start of the document.
    std::uint64_t offset() const;

  private:
    class Library;

    std::unique_ptr<Library> library_;
};

}  // namespace pinwell::values
