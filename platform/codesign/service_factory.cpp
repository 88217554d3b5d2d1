#include "codesign/code_description.h"
#include "codesign/service.h"
#include "foundation/bundle.h"

namespace pinwell::codesign {

std::unique_ptr<CodeSigningService> makeCodeSigningService() {
    return std::make_unique<FileCodeSigningService>(foundation::mainExecutableOfBundle);
}

CodeDescription describeCode(const std::string& path) {
    return describeCode(path, foundation::mainExecutableOfBundle);
}

}  // namespace pinwell::codesign
