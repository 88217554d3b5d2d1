#include "types/mime_database.h"

#include <gio/gio.h>

#include <cstring>
#include <memory>

#include "foundation/bytes.h"
#include "foundation/file_io.h"

namespace pinwell::types {
namespace {

// The database keeps one small XML file per type.
constexpr std::size_t kMaximumTypeFile = 256 * 1024;
constexpr std::size_t kMaximumDescription = 200;

struct GLibFree {
    void operator()(char* text) const { g_free(text); }
};
using GLibString = std::unique_ptr<char, GLibFree>;

struct ContextFree {
    void operator()(GMarkupParseContext* context) const { g_markup_parse_context_free(context); }
};

// Collects the text of the <comment> that has no language.
struct DescriptionReader {
    bool inside = false;
    std::string text;

    static void startElement(GMarkupParseContext*, const gchar* name, const gchar** attributes, const gchar**,
                             gpointer self, GError**) {
        bool hasLanguage = false;
        for (; *attributes != nullptr; ++attributes) hasLanguage |= std::strcmp(*attributes, "xml:lang") == 0;
        auto* reader = static_cast<DescriptionReader*>(self);
        reader->inside = std::strcmp(name, "comment") == 0 && !hasLanguage && reader->text.empty();
    }
    static void endElement(GMarkupParseContext*, const gchar*, gpointer self, GError**) {
        static_cast<DescriptionReader*>(self)->inside = false;
    }
    static void characters(GMarkupParseContext*, const gchar* text, gsize length, gpointer self, GError**) {
        auto* reader = static_cast<DescriptionReader*>(self);
        if (reader->inside) reader->text.append(text, length);
    }
};

// GLib's own question for a description answers in the user's language; messages here are English.
std::optional<std::string> englishDescription(const foundation::Data& document) {
    const GMarkupParser parser{DescriptionReader::startElement, DescriptionReader::endElement,
                               DescriptionReader::characters, nullptr, nullptr};
    DescriptionReader reader;
    const std::unique_ptr<GMarkupParseContext, ContextFree> context(
        g_markup_parse_context_new(&parser, GMarkupParseFlags{}, &reader, nullptr));
    const std::string text = foundation::toString(document);
    const bool parsed =
        g_markup_parse_context_parse(context.get(), text.data(), static_cast<gssize>(text.size()), nullptr) != FALSE;
    if (!parsed || reader.text.empty() || reader.text.size() > kMaximumDescription) return std::nullopt;
    return reader.text;
}

}  // namespace

std::optional<std::string> mimeTypeForName(const std::string& name) {
    gboolean uncertain = FALSE;
    const GLibString type(g_content_type_guess(name.c_str(), nullptr, 0, &uncertain));
    if (type == nullptr || g_content_type_is_unknown(type.get()) != FALSE) return std::nullopt;
    return std::string(type.get());
}

std::optional<std::string> mimeTypeDescription(const std::string& mimeType) {
    const auto inDirectory = [&](const char* directory) -> std::optional<std::string> {
        const auto document =
            foundation::readSmallFile(std::string(directory) + "/mime/" + mimeType + ".xml", kMaximumTypeFile);
        return document ? englishDescription(*document) : std::nullopt;
    };
    if (auto found = inDirectory(g_get_user_data_dir())) return found;
    for (const gchar* const* directory = g_get_system_data_dirs(); *directory != nullptr; ++directory)
        if (auto found = inDirectory(*directory)) return found;
    return std::nullopt;
}

}  // namespace pinwell::types
