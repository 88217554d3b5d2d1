#include "verify/bundle.h"

#include "codesign/code_error.h"
#include "foundation/format.h"
#include "foundation/property_list.h"
#include "verify/bundle_layout.h"
#include "verify/check_names.h"

namespace pinwell::verify {

using codesign::CodeError;

namespace {

/// A property list, or a seal. Longer ones are refused.
constexpr std::uint64_t kMaximumComponent = foundation::kMaximumPropertyListSize;

std::optional<Data> componentAt(const DirectoryRef& root, const std::string& path) {
    if (path.empty()) return std::nullopt;
    try {
        const auto file = root->fileAt(path);
        if (file->size() > kMaximumComponent) codesign::refuse(path + " is too long");
        return file->read(0, static_cast<std::size_t>(file->size()));
    } catch (const CodeError& error) {
        if (error.status() != codesign::kStaticCodeNotFound) throw;
        return std::nullopt;
    }
}

}  // namespace

VerifiedCode verifyBundle(const std::string& path, Workers& workers, Section& section) {
    const BundleLayout layout = layoutOfBundle(path);
    const std::optional<Data> list = componentAt(layout.root, layout.propertyList);
    const std::optional<Data> seal = componentAt(layout.root, kSignatureDirectory + "/" + kSealFile);
    const OutsideComponents outside{{kSlotPropertyList, {.bytes = list ? &*list : nullptr}},
                                    {kSlotResourceSeal, {.bytes = seal ? &*seal : nullptr}}};
    const auto executable = layout.root->fileAt(layout.executable);
    return verifyExecutable(*executable, outside, layout.rootPath + "/" + layout.executable, workers,
                            section);
}

}  // namespace pinwell::verify
