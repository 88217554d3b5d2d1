#include "values/xml_parser.h"

#include <expat.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <new>
#include <type_traits>
#include <utility>

#include "base/handle.h"

namespace pinwell::values {
namespace {

using base::ByteView;

static_assert(std::is_same_v<XML_Char, char>, "the library is built for UTF-8");

// The library parses an incomplete tag or comment again with each further piece.
constexpr std::size_t kPieceSize = std::size_t{256} * 1024;

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

// The library's allocator gets no context, so this holds the remaining memory of the document that this
// thread is parsing. A block begins with its size.
thread_local std::size_t* memoryLeft = nullptr;

struct alignas(std::max_align_t) BlockHeader {
    std::size_t size;
};

void* allocate(std::size_t size) {
    if (memoryLeft == nullptr || size > *memoryLeft || size > kMaximumXMLMemory) return nullptr;
    void* const block = std::malloc(sizeof(BlockHeader) + size);  // NOLINT(*-no-malloc)
    if (block == nullptr) return nullptr;
    *memoryLeft -= size;
    auto* const header = new (block) BlockHeader{size};
    return header + 1;
}

void release(void* memory) {
    if (memory == nullptr) return;
    BlockHeader* const block = static_cast<BlockHeader*>(memory) - 1;
    if (memoryLeft != nullptr) *memoryLeft += block->size;
    std::free(block);  // NOLINT(*-no-malloc)
}

void* reallocate(void* memory, std::size_t size) {
    if (memory == nullptr) return allocate(size);
    void* const larger = allocate(size);
    if (larger == nullptr) return nullptr;
    std::memcpy(larger, memory, std::min(size, (static_cast<BlockHeader*>(memory) - 1)->size));
    release(memory);
    return larger;
}

// Makes the library allocate from `left` while this lives.
class Allowance {
  public:
    explicit Allowance(std::size_t& left) : before_(std::exchange(memoryLeft, &left)) {}
    ~Allowance() { memoryLeft = before_; }
    Allowance(const Allowance&) = delete;
    Allowance& operator=(const Allowance&) = delete;

  private:
    std::size_t* before_;
};

bool equalIgnoringCase(std::string_view text, std::string_view upperCase) {
    return std::equal(text.begin(), text.end(), upperCase.begin(), upperCase.end(), [](char a, char b) {
        return (a >= 'a' && a <= 'z' ? static_cast<char>(a - 'a' + 'A') : a) == b;
    });
}

}  // namespace

std::optional<std::string_view> XMLAttributes::operator[](std::string_view name) const {
    for (const char* const* word = words_; word[0] != nullptr; word += 2)
        if (word[0] == name) return word[1];
    return std::nullopt;
}

class XMLParser::Library {
  public:
    Library(XMLEvents& events, DocumentType documentType) : events_(events), documentType_(documentType) {
        const XML_Memory_Handling_Suite memory{allocate, reallocate, release};
        const Allowance allowance(memoryLeft_);
        handle_.reset(XML_ParserCreate_MM(nullptr, &memory, nullptr));
        if (!handle_) throw std::bad_alloc();
        XML_SetUserData(handle_.get(), this);
        setHandlers();
    }

    void feed(ByteView bytes) {
        // Pieces are passed on whole, or joined from smaller ones.
        while (!bytes.empty()) {
            const std::size_t count = std::min(bytes.size(), kPieceSize - pending_);
            std::transform(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(count),
                           piece_.begin() + static_cast<std::ptrdiff_t>(pending_),
                           [](std::byte byte) { return static_cast<char>(byte); });
            pending_ += count;
            bytes = bytes.subspan(count);
            if (pending_ == kPieceSize) parse(false);
        }
    }

    void finish() { parse(true); }

    std::uint64_t offset() const {
#if XML_MAJOR_VERSION > 2 || XML_MINOR_VERSION >= 9  // the older name is deprecated from 2.9 on
        return static_cast<std::uint64_t>(
            std::max<std::int64_t>(XML_GetCurrentByteIndex64(handle_.get()), 0));
#else
        return static_cast<std::uint64_t>(std::max<XML_Index>(XML_GetCurrentByteIndex(handle_.get()), 0));
#endif
    }

  private:
    void setHandlers() {
        XML_SetElementHandler(
            handle_.get(),
            [](void* self, const char* name, const char** attributes) {
                guarded(self, [&](Library& it) { it.events_.begin(name, XMLAttributes(attributes)); });
            },
            [](void* self, const char* name) { guarded(self, [&](Library& it) { it.events_.end(name); }); });
        XML_SetCharacterDataHandler(handle_.get(), [](void* self, const char* text, int length) {
            guarded(self, [&](Library& it) { it.events_.text({text, static_cast<std::size_t>(length)}); });
        });
        XML_SetXmlDeclHandler(handle_.get(), [](void* self, const char* version, const char* encoding, int) {
            guarded(self, [&](Library& it) { it.declaration(version, encoding); });
        });
        XML_SetStartDoctypeDeclHandler(
            handle_.get(), [](void* self, const char*, const char*, const char*, int hasDeclarations) {
                guarded(self, [&](Library& it) { it.beginDocumentType(hasDeclarations != 0); });
            });
        XML_SetSkippedEntityHandler(handle_.get(), [](void* self, const char*, int) {
            guarded(self, [](Library& it) { it.refuse("reference to an entity that is not declared"); });
        });
    }

    // No exception may pass through the library, which is C. It may send another event after it was stopped.
    template <class Action>
    static void guarded(void* library, Action action) noexcept {
        Library& self = *static_cast<Library*>(library);
        if (self.failure_) return;
        try {
            action(self);
        } catch (...) {
            self.failure_ = std::current_exception();
            XML_StopParser(self.handle_.get(), XML_FALSE);
        }
    }

    [[noreturn]] void refuse(const char* what) const {
        throw MalformedXML(offset(), what);
    }

    // Null for a missing version or encoding.
    void declaration(const char* version, const char* encoding) {
        if (version == nullptr || !std::string_view(version).starts_with("1.")) refuse("version of XML");
        if (encoding == nullptr || equalIgnoringCase(encoding, "UTF-8")) return;
        const bool isKnown =
            equalIgnoringCase(encoding, "ISO-8859-1") || equalIgnoringCase(encoding, "US-ASCII");
        if (!isKnown || isMarked_) refuse("encoding");
    }

    void beginDocumentType(bool hasDeclarations) const {
        if (documentType_ == DocumentType::refused) refuse("document type");
        if (hasDeclarations) refuse("document type with an internal subset");
    }

    // UTF-16, which the library would recognise by these bytes, with or without a declaration.
    void examineStart() {
        const std::string_view start(piece_.data(), std::min(pending_, kByteOrderMark.size()));
        isMarked_ = start == kByteOrderMark;
        const std::string_view pair = start.substr(0, 2);
        if (pair.find('\0') != std::string_view::npos || pair == "\xFF\xFE" || pair == "\xFE\xFF")
            throw MalformedXML(0, "encoding");
    }

    void parse(bool isLast) {
        if (!std::exchange(isStarted_, true)) examineStart();
        const Allowance allowance(memoryLeft_);
        const auto status =
            XML_Parse(handle_.get(), piece_.data(), static_cast<int>(pending_), isLast ? 1 : 0);
        pending_ = 0;
        if (failure_) std::rethrow_exception(failure_);
        if (status == XML_STATUS_OK) return;
        const XML_Error error = XML_GetErrorCode(handle_.get());
        throw MalformedXML(
            offset(), error == XML_ERROR_NO_MEMORY ? "markup out of proportion" : XML_ErrorString(error));
    }

    XMLEvents& events_;
    const DocumentType documentType_;
    std::size_t memoryLeft_ = kMaximumXMLMemory;
    base::Handle<std::remove_pointer_t<XML_Parser>, XML_ParserFree> handle_;
    std::array<char, kPieceSize> piece_;
    std::size_t pending_ = 0;
    std::exception_ptr failure_;
    bool isStarted_ = false;
    bool isMarked_ = false;
};

XMLParser::XMLParser(XMLEvents& events, DocumentType documentType)
    : library_(std::make_unique<Library>(events, documentType)) {}
XMLParser::~XMLParser() = default;

void XMLParser::feed(ByteView bytes) {
    library_->feed(bytes);
}
void XMLParser::finish() {
    library_->finish();
}
std::uint64_t XMLParser::offset() const {
    return library_->offset();
}

}  // namespace pinwell::values
