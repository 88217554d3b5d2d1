#include "find.h"

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "base/byte_source.h"
#include "base/places.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "src/PWHashedFile/file_kind.h"
#include "values/format.h"
#include "values/url.h"

namespace pinwell::gate {

namespace {

namespace fs = std::filesystem;

bool beginsAsExecutable(const std::string& path) {
    try {
        return codesign::isExecutableImage(codesign::openCode(base::Places(), path));
    } catch (const codesign::CodeError&) {
        return false;
    } catch (const base::ReadFailure&) {
        return false;
    }
}

class Tree {
  public:
    explicit Tree(const Platform& platform) : platform_(platform) {}

    void visit(const std::string& path, unsigned depth) {
        std::error_code error;
        // The caller's path may be a link; below it, links are not followed.
        const fs::file_status status = depth == 0 ? fs::status(path, error) : fs::symlink_status(path, error);
        const bool isDirectory = fs::is_directory(status);
        if (!isDirectory && !fs::is_regular_file(status)) return;
        if (isArtefact(path, isDirectory)) {
            found_.paths.push_back(path);
        } else if (isDirectory) {
            descend(path, depth);
        }
    }

    FoundArtefacts take() && { return std::move(found_); }

  private:
    bool isArtefact(const std::string& path, bool isDirectory) const {
        const values::URL url = values::URL::fileURLWithPath(path);
        const auto properties = platform_.files.resourceProperties(url);
        if (!properties) return false;
        switch (assessmentClassForUTI(platform_.types, properties->typeIdentifier, url.pathExtension())) {
            case AssessmentClass::diskImage:
            case AssessmentClass::package:
                return !isDirectory;
            case AssessmentClass::bundle:
                return isDirectory || beginsAsExecutable(path);
            case AssessmentClass::unknown:
                break;
        }
        return isDirectory ? platform_.files.mainExecutableOfBundle(url).has_value()
                           : beginsAsExecutable(path);
    }

    void descend(const std::string& path, unsigned depth) {
        if (depth == kMaximumTreeDepth) return complain(path + " is too deep");
        std::vector<std::string> entries;
        std::error_code error;
        fs::directory_iterator it(path, error);
        for (; !error && it != fs::directory_iterator(); it.increment(error)) {
            if (++entries_ > kMaximumTreeEntries) return complain("there are too many files");
            entries.push_back(it->path().native());
        }
        if (error) complain(path + ": " + error.message());
        std::sort(entries.begin(), entries.end());
        for (const std::string& entry : entries) visit(entry, depth + 1);
    }

    void complain(std::string what) {
        if (found_.problem.empty()) found_.problem = std::move(what);
    }

    const Platform& platform_;
    FoundArtefacts found_;
    std::size_t entries_ = 0;
};

}  // namespace

FoundArtefacts findArtefacts(const std::string& path, const Platform& platform) {
    Tree tree(platform);
    tree.visit(path, 0);
    return std::move(tree).take();
}

}  // namespace pinwell::gate
