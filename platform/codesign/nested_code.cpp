#include "codesign/nested_code.h"

#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "codesign/code_error.h"
#include "foundation/byte_reader.h"

namespace pinwell::codesign {

namespace {

namespace fs = std::filesystem;

class BundleWalk {
  public:
    explicit BundleWalk(const MainExecutableFinder& finder) : finder_(finder) {}

    void directory(const std::string& path, unsigned depth) {
        if (depth > kMaximumBundleDepth) throw CodeError(kUnimplemented, "the bundle is too deep");
        if (isRegularFile(path + "/Contents/_CodeSignature/CodeDirectory"))
            collect(path, CodeKind::separatelySigned);
        for (const std::string& name : names(path)) {
            const std::string entry = path + "/" + name;
            struct stat status = {};
            if (lstat(entry.c_str(), &status) != 0) continue;
            if (S_ISDIR(status.st_mode)) directory(entry, depth + 1);
            if (S_ISREG(status.st_mode)) collect(entry, CodeKind::executableImage);
        }
    }

    std::vector<CodeSignature> take() && { return std::move(found_); }

  private:
    static bool isRegularFile(const std::string& path) {
        struct stat status = {};
        return lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
    }

    std::vector<std::string> names(const std::string& path) {
        std::vector<std::string> result;
        std::error_code error;
        for (fs::directory_iterator it(path, error); !error && it != fs::directory_iterator();
             it.increment(error)) {
            if (++entries_ > kMaximumBundleEntries)
                throw CodeError(kUnimplemented, "the bundle is too large");
            result.push_back(it->path().filename().native());
        }
        std::sort(result.begin(), result.end());
        return result;
    }

    void collect(const std::string& path, CodeKind kind) {
        try {
            const std::shared_ptr<FileCode> code = FileCode::atPath(path, finder_);
            if (code->kind() != kind) return;
            std::vector<CodeSignature> signatures = code->allSignatures();
            for (const CodeSignature& signature : signatures) signature.requireValid();
            std::move(signatures.begin(), signatures.end(), std::back_inserter(found_));
        } catch (const CodeError&) {
            // Passed over: what the bundle carries beside good code does not make the good code unknown.
        } catch (const foundation::ShortRead&) {
        }
    }

    const MainExecutableFinder& finder_;
    std::size_t entries_ = 0;
    std::vector<CodeSignature> found_;
};

}  // namespace

std::vector<CodeSignature> findNestedSignatures(const std::string& bundlePath,
                                                const MainExecutableFinder& finder) {
    BundleWalk walk(finder);
    walk.directory(bundlePath, 0);
    return std::move(walk).take();
}

}  // namespace pinwell::codesign
