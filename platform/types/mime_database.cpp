#include "types/mime_database.h"

#include <gio/gio.h>

#include <algorithm>
#include <memory>
#include <vector>

#include "foundation/file_io.h"

namespace pinwell::types {
namespace {

constexpr std::size_t kLongestExtension = 255;  // of any file name on the host
constexpr std::size_t kLargestDescription = 256 * 1024;

struct FreeText {
    void operator()(char* text) const { g_free(text); }
};
struct FreeParser {
    void operator()(GMarkupParseContext* context) const { g_markup_parse_context_free(context); }
};

// "text/plain": two parts that can stand in a path.
bool isWellFormed(std::string_view type) {
    const auto isPart = [](std::string_view part) {
        return !part.empty() && part.front() != '.' && std::all_of(part.begin(), part.end(), [](char c) {
            return g_ascii_isalnum(c) || std::string_view("-+._").find(c) != std::string_view::npos;
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

std::string untranslatedComment(foundation::ByteView document) {
    const std::string text = foundation::toString(document);
    const GMarkupParser parser{CommentReader::startElement, CommentReader::endElement, CommentReader::text,
                               nullptr, nullptr};
    CommentReader reader;
    const std::unique_ptr<GMarkupParseContext, FreeParser> context(
        g_markup_parse_context_new(&parser, GMarkupParseFlags{}, &reader, nullptr));
    const bool parsed = g_markup_parse_context_parse(context.get(), text.data(),
                                                     static_cast<gssize>(text.size()), nullptr) != FALSE;
    return parsed ? reader.comment : std::string();
}

// Where the database's parts are, the user's own first.
std::vector<std::string> dataDirectories() {
    std::vector<std::string> directories{g_get_user_data_dir()};
    for (const char* const* directory = g_get_system_data_dirs(); *directory != nullptr; ++directory)
        directories.emplace_back(*directory);
    return directories;
}

}  // namespace

std::optional<std::string> mimeTypeForExtension(std::string_view extension) {
    const bool canBeInAName = extension.find('\0') == std::string_view::npos &&
                              extension.find('/') == std::string_view::npos &&
                              extension.size() <= kLongestExtension;
    if (!canBeInAName) return std::nullopt;
    // No contents are handed over, and none are looked for: the library opens nothing by this name.
    const std::string name = "name." + std::string(extension);
    const std::unique_ptr<char, FreeText> type(g_content_type_guess(name.c_str(), nullptr, 0, nullptr));
    const bool isKnown = type != nullptr && !g_content_type_is_unknown(type.get()) &&
                         std::string_view(type.get()) != "application/x-zerosize" && isWellFormed(type.get());
    if (!isKnown) return std::nullopt;
    return type.get();
}

std::optional<std::string> mimeDescription(const std::string& mimeType) {
    if (!isWellFormed(mimeType)) return std::nullopt;
    for (const std::string& directory : dataDirectories()) {
        const auto document =
            foundation::readSmallFile(directory + "/mime/" + mimeType + ".xml", kLargestDescription);
        if (!document) continue;
        if (std::string comment = untranslatedComment(*document); !comment.empty()) return comment;
    }
    return std::nullopt;
}

}  // namespace pinwell::types
