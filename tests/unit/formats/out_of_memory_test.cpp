// The result of a step without memory. This program replaces its allocation functions by functions that can
// fail on demand; by default they are malloc.
#include <gtest/gtest.h>

#include <cstdlib>
#include <new>

#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/fake_trust_service.h"
#include "support/replaced_allocation.h"
#include "support/ticket_builder.h"

namespace {

constexpr std::size_t kNever = static_cast<std::size_t>(-1);
thread_local std::size_t failingSize = kNever;

// During its life, this thread gets no block of that size or more.
class MemoryShortage {
  public:
    explicit MemoryShortage(std::size_t size) { failingSize = size; }
    ~MemoryShortage() { failingSize = kNever; }
    MemoryShortage(const MemoryShortage&) = delete;
    MemoryShortage& operator=(const MemoryShortage&) = delete;
};

}  // namespace

bool pinwell::test::mayAllocate(std::size_t size) noexcept {
    return size < failingSize;
}

namespace pinwell {
namespace {

namespace status = satchel_status;

using base::Data;
using values::Dictionary;
using values::Value;

constexpr std::size_t kEntries = 1000;
constexpr std::size_t kPayloadSize = kTicketHeaderSize + kEntries * 20;

Data largePayload() {
    return test::TicketPayloadBuilder().version(1).count(kEntries).trailing(Data(kEntries * 20)).build();
}

TEST(OutOfMemory, RefusesToDecodeATicket) {
    const Data payload = largePayload();
    ASSERT_EQ(payload.size(), kPayloadSize);
    tm_ticket* ticket = nullptr;
    {
        const MemoryShortage shortage(kPayloadSize);
        EXPECT_EQ(tm_ticket_decode(payload.data(), kPayloadSize, &ticket), -1);
    }
    EXPECT_EQ(ticket, nullptr);
}

TEST(OutOfMemory, TicketTakesOneBlockOfItsPayloadsSize) {
    const Data payload = largePayload();
    tm_ticket* decoded = nullptr;
    {
        const MemoryShortage shortage(kPayloadSize + 1);
        EXPECT_EQ(tm_ticket_decode(payload.data(), kPayloadSize, &decoded), 0);
    }
    const TicketPointer ticket(decoded);
    EXPECT_NE(ticket, nullptr);
}

TEST(OutOfMemory, CopiesNoTicket) {
    const Data payload = largePayload();
    tm_ticket* decoded = nullptr;
    ASSERT_EQ(tm_ticket_decode(payload.data(), kPayloadSize, &decoded), 0);
    const TicketPointer ticket(decoded);
    const tm_ticket* copy = ticket.get();
    {
        const MemoryShortage shortage(kPayloadSize);
        copy = tm_ticket_copy(ticket.get());
    }
    EXPECT_EQ(copy, nullptr);
}

TEST(OutOfMemory, LeavesAnOptionAsItWas) {
    const Dictionary before{{"key", "old"}};
    Dictionary options = before;
    Value value("new");
    trust::Status result = status::kSuccess;
    {
        const MemoryShortage shortage(0);
        result = _satchel_fuse_option(options, "key", std::move(value));
    }
    EXPECT_EQ(result, status::kNotAvailable);
    EXPECT_EQ(options, before);
}

TEST(OutOfMemory, MakesNoPolicy) {
    class WithoutNamedPolicy : public test::FakeTrustService {
      public:
        std::optional<trust::PolicyRef> namedPolicy(const std::string&) const override {
            failingSize = 0;  // the constructor's name is one more allocation, which is not under test
            return std::nullopt;
        }
    } service;
    trust::PolicyRef policy;
    trust::Status result = status::kSuccess;
    {
        const MemoryShortage shortage(kNever);
        result = _satchel_create_cert_policy(&policy, service);
    }
    EXPECT_EQ(result, status::kNotAvailable);
    EXPECT_EQ(policy, nullptr);
}

}  // namespace
}  // namespace pinwell
