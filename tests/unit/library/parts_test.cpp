// Parts of the library that its interface does not show by themselves.
#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <set>

#include "library/c_calls.h"
#include "library/handles.h"

namespace pinwell::library {
namespace {

TEST(ErrorMessage, IsCutBetweenCharactersAndEndsWithAZero) {
    pinwell_error error = PINWELL_ERROR_INIT;
    // Characters of two bytes, after one byte and after none: one of the two texts is cut inside a character.
    for (const char* const start : {"", "a"}) {
        std::string message = start;
        for (int i = 0; i < 300; ++i) message += "\xc3\xa9";
        EXPECT_EQ(report({PINWELL_ERROR_MALFORMED, message, 0, 7}, &error), PINWELL_ERROR_MALFORMED);
        const std::string kept = error.message;
        EXPECT_GE(kept.size(), sizeof error.message - 2);
        EXPECT_TRUE(message.starts_with(kept));
        EXPECT_EQ((kept.size() - std::strlen(start)) % 2, 0U);
        EXPECT_EQ(error.offset, 7U);
    }
}

TEST(ErrorMessage, IsOfThisFailureAlone) {
    pinwell_error error = PINWELL_ERROR_INIT;
    report({PINWELL_ERROR_UNREADABLE, "a long message", 2, 9}, &error);
    report({PINWELL_ERROR_ARGUMENT, "short"}, &error);
    EXPECT_STREQ(error.message, "short");
    EXPECT_EQ(error.system_error, 0);
    EXPECT_EQ(error.offset, 0U);
    for (std::size_t i = 5; i < sizeof error.message; ++i) EXPECT_EQ(error.message[i], 0) << i;
}

TEST(Guarded, TurnsWhateverIsThrownIntoAStatus) {
    pinwell_error error = PINWELL_ERROR_INIT;
    EXPECT_EQ(guarded(&error, [] {}), PINWELL_OK);
    EXPECT_EQ(guarded(&error, [] { throw std::bad_alloc(); }), PINWELL_ERROR_MEMORY);
    EXPECT_STREQ(error.message, pinwell_error_text(PINWELL_ERROR_MEMORY));
    EXPECT_EQ(guarded(&error, [] { throw std::runtime_error("a fault"); }), PINWELL_ERROR_INTERNAL);
    EXPECT_STREQ(error.message, "a fault");
    EXPECT_EQ(guarded(&error, [] { throw 7; }), PINWELL_ERROR_INTERNAL);
    EXPECT_EQ(guarded(nullptr, [] { throw 7; }), PINWELL_ERROR_INTERNAL);
}

struct Handle;
struct OtherHandle;

TEST(HandleTable, GivesOutNumbersThatAreNoAddressesAndNeverTheSameTwice) {
    HandleTable<Handle, int> table;
    HandleTable<OtherHandle, int> other;
    std::set<std::uintptr_t> numbers;
    for (int i = 0; i < 100; ++i) {
        Handle* const handle = table.add(std::make_shared<const int>(i));
        OtherHandle* const another = other.add(std::make_shared<const int>(i));
        numbers.insert({reinterpret_cast<std::uintptr_t>(handle), reinterpret_cast<std::uintptr_t>(another)});
        EXPECT_EQ(*table.find(handle), i);
        EXPECT_EQ(table.find(reinterpret_cast<Handle*>(another)), nullptr);
        EXPECT_TRUE(table.remove(handle));
        EXPECT_FALSE(table.remove(handle));
        EXPECT_EQ(table.find(handle), nullptr);
    }
    EXPECT_EQ(numbers.size(), 200U);
    for (const std::uintptr_t number : numbers) EXPECT_EQ(number % 2, 1U);
}

TEST(HandleTable, KeepsAnObjectForWhoeverHasFoundIt) {
    HandleTable<Handle, int> table;
    Handle* const handle = table.add(std::make_shared<const int>(5));
    const auto found = table.find(handle);
    EXPECT_TRUE(table.remove(handle));
    EXPECT_EQ(*found, 5);
}

}  // namespace
}  // namespace pinwell::library
