#include <utility>

#include "codesign/code_description.h"
#include "codesign/service.h"
#include "foundation/bundle.h"

namespace pinwell::codesign {

namespace {

CodeAccess accessThrough(std::shared_ptr<foundation::Places> places) {
    return {std::move(places), [](foundation::Places& all, const std::string& path) {
                return foundation::mainExecutableOfBundle(all, path);
            }};
}

}  // namespace

std::unique_ptr<CodeSigningService> makeCodeSigningService(std::shared_ptr<foundation::Places> places) {
    return std::make_unique<FileCodeSigningService>(accessThrough(std::move(places)));
}

CodeDescription describeCode(const std::string& path) {
    return describeCode(path, accessThrough(std::make_shared<foundation::Places>()));
}

}  // namespace pinwell::codesign
