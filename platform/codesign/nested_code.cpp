#include "codesign/nested_code.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <memory>

#include "codesign/code_error.h"
#include "foundation/byte_reader.h"

namespace pinwell::codesign {

namespace {

struct DirectoryCloser {
    void operator()(DIR* directory) const noexcept { closedir(directory); }
};
using DirectoryStream = std::unique_ptr<DIR, DirectoryCloser>;

class BundleWalk {
  public:
    explicit BundleWalk(const CodeAccess& access) : access_(access) {}

    void directory(const std::string& path, unsigned depth) {
        if (depth > kMaximumBundleDepth) throw CodeError(kUnimplemented, "the bundle is too deep");
        if (S_ISREG(typeOf(path + "/Contents/_CodeSignature/CodeDirectory")))
            collect(path, CodeKind::separatelySigned);
        for (const std::string& name : names(path)) {
            const std::string entry = path + "/" + name;
            const mode_t type = typeOf(entry);
            if (S_ISDIR(type)) directory(entry, depth + 1);
            if (S_ISREG(type)) collect(entry, CodeKind::executableImage);
        }
    }

    std::vector<CodeSignature> take() && { return std::move(found_); }

  private:
    // The type of the item itself, without following a link; 0 if stat fails.
    mode_t typeOf(const std::string& path) const {
        const auto place = access_.places->find(path);
        const auto status = place ? place->status() : place.error();
        return status ? status->st_mode : 0;
    }

    std::vector<std::string> names(const std::string& path) {
        std::vector<std::string> result;
        const auto place = access_.places->find(path);
        auto opened = place ? place->open(O_RDONLY | O_DIRECTORY) : place.error();
        if (!opened) return result;
        const DirectoryStream stream(fdopendir(opened->get()));
        if (!stream) return result;
        static_cast<void>(opened->release());  // the stream owns it now
        while (const dirent* const entry = readdir(stream.get())) {
            const std::string name(&entry->d_name[0]);
            if (name == "." || name == "..") continue;
            if (++entries_ > kMaximumBundleEntries)
                throw CodeError(kUnimplemented, "the bundle is too large");
            result.push_back(name);
        }
        std::sort(result.begin(), result.end());
        return result;
    }

    void collect(const std::string& path, CodeKind kind) {
        try {
            const std::shared_ptr<FileCode> code = FileCode::atPath(path, access_);
            if (code->kind() != kind) return;
            std::vector<CodeSignature> signatures = code->allSignatures();
            for (const CodeSignature& signature : signatures) signature.requireValid();
            std::move(signatures.begin(), signatures.end(), std::back_inserter(found_));
        } catch (const CodeError&) {
            // Skipped: bad code in the bundle must not hide the good code.
        } catch (const foundation::ShortRead&) {
        }
    }

    const CodeAccess& access_;
    std::size_t entries_ = 0;
    std::vector<CodeSignature> found_;
};

}  // namespace

std::vector<CodeSignature> findNestedSignatures(const std::string& bundlePath, const CodeAccess& access) {
    const auto anchor = access.places->hold(bundlePath);
    if (!anchor) return {};
    BundleWalk walk(access);
    walk.directory(bundlePath, 0);
    return std::move(walk).take();
}

}  // namespace pinwell::codesign
