// Bytes and DER elements, put together by hand.
#pragma once

#include <initializer_list>
#include <vector>

#include "foundation/bytes.h"
#include "support/ticket_builder.h"

namespace pinwell::trust {

inline foundation::Data bytes(std::initializer_list<unsigned> values) {
    foundation::Data data;
    for (const unsigned value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

inline foundation::Data joined(const std::vector<foundation::Data>& parts) {
    foundation::Data all;
    for (const foundation::Data& part : parts) foundation::append(all, part);
    return all;
}

using test::derElement;

}  // namespace pinwell::trust
