// Handles of the C interface that free themselves, and its texts as strings.
#pragma once

#include <gtest/gtest.h>
#include <pinwell/ticket_c.h>

#include <memory>
#include <string>

namespace pinwell::test {

struct FreeHandle {
    void operator()(pinwell_roots* roots) const { EXPECT_EQ(pinwell_roots_free(roots), PINWELL_OK); }
    void operator()(pinwell_result* result) const { EXPECT_EQ(pinwell_result_free(result), PINWELL_OK); }
    void operator()(pinwell_ticket* ticket) const { EXPECT_EQ(pinwell_ticket_free(ticket), PINWELL_OK); }
};
using CRoots = std::unique_ptr<pinwell_roots, FreeHandle>;
using CResult = std::unique_ptr<pinwell_result, FreeHandle>;
using CTicket = std::unique_ptr<pinwell_ticket, FreeHandle>;

inline CRoots cRoots(const std::string& platform) {
    pinwell_roots* roots = nullptr;
    EXPECT_EQ(pinwell_roots_from_directory(platform.c_str(), platform.size(), &roots, nullptr), PINWELL_OK);
    return CRoots(roots);
}

inline CResult judged(const std::string& path, const CRoots& roots) {
    pinwell_result* result = nullptr;
    pinwell_error error = PINWELL_ERROR_INIT;
    EXPECT_EQ(pinwell_judge_file(path.c_str(), path.size(), roots.get(), nullptr, &result, &error),
              PINWELL_OK)
        << error.message;
    return CResult(result);
}

inline CResult verified(const std::string& path, const CRoots& roots,
                        const pinwell_options* options = nullptr) {
    pinwell_result* result = nullptr;
    pinwell_error error = PINWELL_ERROR_INIT;
    EXPECT_EQ(pinwell_verify_file(path.c_str(), path.size(), roots.get(), options, &result, &error),
              PINWELL_OK)
        << error.message;
    return CResult(result);
}

template <class Function, class Handle>
std::string textOf(Function function, const Handle& handle) {
    std::size_t length = 0;
    const auto* const text = function(handle.get(), &length);
    return text == nullptr ? std::string() : std::string(reinterpret_cast<const char*>(text), length);
}

}  // namespace pinwell::test
