// Property lists for the samples.
#pragma once

#include "foundation/bytes.h"
#include "foundation/value.h"

namespace pinwell::lumora {

/// The XML form. Throws Failure when it cannot be made.
foundation::Data propertyListDocument(const foundation::Dictionary& dictionary);

}  // namespace pinwell::lumora
