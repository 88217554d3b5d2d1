#include "codesign/service.h"
#include "foundation/bundle.h"

namespace pinwell::codesign {

std::unique_ptr<CodeSigningService> makeCodeSigningService() {
    return std::make_unique<FileCodeSigningService>(foundation::mainExecutableOfBundle);
}

}  // namespace pinwell::codesign
