#include "lumora-local/property_list_document.h"

#include <utility>

#include "foundation/property_list.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {

foundation::Data propertyListDocument(const foundation::Dictionary& dictionary) {
    foundation::Result<foundation::Data> document = foundation::serializePropertyList(dictionary);
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    return *std::move(document);
}

}  // namespace pinwell::lumora
