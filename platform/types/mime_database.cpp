#include "mime_database.h"

#include <gio/gio.h>

#include <algorithm>
#include <memory>
#include <vector>

#include "base/bytes.h"
#include "base/file_io.h"
#include "runtime/process.h"

namespace pinwell::types {
namespace {

constexpr std::size_t kLongestExtension = 255;  // of any file name on the host
constexpr std::size_t kLargestDescription = 256 * 1024;

// The library's functions, found at the first extension that this platform does not declare itself.
struct Gio {
    Gio() {
        runtime::LazyLibrary library("libgio-2.0.so.0");
        library.find(contentTypeGuess, "g_content_type_guess");
        library.find(contentTypeIsUnknown, "g_content_type_is_unknown");
        library.find(freeText, "g_free");
        library.find(parserNew, "g_markup_parse_context_new");
        library.find(parserParse, "g_markup_parse_context_parse");
        library.find(parserFree, "g_markup_parse_context_free");
        library.find(userDataDirectory, "g_get_user_data_dir");
        library.find(systemDataDirectories, "g_get_system_data_dirs");
        isThere = library.isComplete();
    }

    decltype(g_content_type_guess)* contentTypeGuess = nullptr;
    decltype(g_content_type_is_unknown)* contentTypeIsUnknown = nullptr;
    decltype(g_free)* freeText = nullptr;
    decltype(g_markup_parse_context_new)* parserNew = nullptr;
    decltype(g_markup_parse_context_parse)* parserParse = nullptr;
    decltype(g_markup_parse_context_free)* parserFree = nullptr;
    decltype(g_get_user_data_dir)* userDataDirectory = nullptr;
    decltype(g_get_system_data_dirs)* systemDataDirectories = nullptr;
    bool isThere = false;
};

const Gio& gio() {
    static const Gio functions;
    return functions;
}

struct FreeText {
    void operator()(char* text) const { gio().freeText(text); }
};
struct FreeParser {
    void operator()(GMarkupParseContext* context) const { gio().parserFree(context); }
};

bool isLetterOrDigit(char c) {
    return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
}

// "text/plain": two parts that are safe in a path.
bool isWellFormed(std::string_view type) {
    const auto isPart = [](std::string_view part) {
        return !part.empty() && part.front() != '.' && std::all_of(part.begin(), part.end(), [](char c) {
            return isLetterOrDigit(c) || std::string_view("-+._").find(c) != std::string_view::npos;
        });
    };
    const std::size_t slash = type.find('/');
    return slash != std::string_view::npos && isPart(type.substr(0, slash)) && isPart(type.substr(slash + 1));
}

// The <comment> without a language among the children of the document's root.
struct CommentReader {
    bool inComment = false;
    std::string comment;

    static void startElement(GMarkupParseContext*, const char* name, const char** attributes, const char**,
                             void* self, GError**) {
        const std::string_view element(name);
        static_cast<CommentReader*>(self)->inComment = element == "comment" && *attributes == nullptr;
    }
    static void endElement(GMarkupParseContext*, const char*, void* self, GError**) {
        static_cast<CommentReader*>(self)->inComment = false;
    }
    static void text(GMarkupParseContext*, const char* characters, gsize length, void* self, GError**) {
        auto* reader = static_cast<CommentReader*>(self);
        if (reader->inComment) reader->comment.append(characters, length);
    }
};

std::string untranslatedComment(base::ByteView document) {
    const std::string text = base::toString(document);
    const GMarkupParser parser{CommentReader::startElement, CommentReader::endElement, CommentReader::text,
                               nullptr, nullptr};
    CommentReader reader;
    const std::unique_ptr<GMarkupParseContext, FreeParser> context(
        gio().parserNew(&parser, GMarkupParseFlags{}, &reader, nullptr));
    const bool parsed =
        gio().parserParse(context.get(), text.data(), static_cast<gssize>(text.size()), nullptr) != FALSE;
    return parsed ? reader.comment : std::string();
}

// The directories of the database, the user's own first.
std::vector<std::string> dataDirectories() {
    std::vector<std::string> directories{gio().userDataDirectory()};
    for (const char* const* directory = gio().systemDataDirectories(); *directory != nullptr; ++directory)
        directories.emplace_back(*directory);
    return directories;
}

}  // namespace

std::optional<std::string> mimeTypeForExtension(std::string_view extension) {
    const bool canBeInAName = extension.find('\0') == std::string_view::npos &&
                              extension.find('/') == std::string_view::npos &&
                              extension.size() <= kLongestExtension;
    if (!canBeInAName || !gio().isThere) return std::nullopt;
    // No contents are passed, and the library opens no file of this name.
    const std::string name = "name." + std::string(extension);
    const std::unique_ptr<char, FreeText> type(gio().contentTypeGuess(name.c_str(), nullptr, 0, nullptr));
    const bool isKnown = type != nullptr && !gio().contentTypeIsUnknown(type.get()) &&
                         std::string_view(type.get()) != "application/x-zerosize" && isWellFormed(type.get());
    if (!isKnown) return std::nullopt;
    return std::string(type.get());
}

std::optional<std::string> mimeDescription(const std::string& mimeType) {
    if (!isWellFormed(mimeType) || !gio().isThere) return std::nullopt;
    for (const std::string& directory : dataDirectories()) {
        const auto document =
            base::readSmallFile(directory + "/mime/" + mimeType + ".xml", kLargestDescription);
        if (!document) continue;
        if (std::string comment = untranslatedComment(*document); !comment.empty()) return comment;
    }
    return std::nullopt;
}

}  // namespace pinwell::types
