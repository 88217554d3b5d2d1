// Bytes and DER elements, put together by hand.
#pragma once

#include <initializer_list>
#include <vector>

#include "base/bytes.h"
#include "support/ticket_builder.h"

namespace pinwell::trust {

inline base::Data bytes(std::initializer_list<unsigned> values) {
    base::Data data;
    for (const unsigned value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

inline base::Data joined(const std::vector<base::Data>& parts) {
    base::Data all;
    for (const base::Data& part : parts) base::append(all, part);
    return all;
}

using test::derElement;

}  // namespace pinwell::trust
