#include "trust/name_constraints.h"

#include <gtest/gtest.h>

#include "elements.h"
#include "trust/general_name.h"

namespace pinwell::trust {
namespace {

using base::Data;

NameConstraints permitted(std::vector<std::string> names) {
    NameConstraints constraints;
    constraints.permitted.dnsNames = std::move(names);
    return constraints;
}
NameConstraints excluded(std::vector<std::string> names) {
    NameConstraints constraints;
    constraints.excluded.dnsNames = std::move(names);
    return constraints;
}

NameJudgement judge(const NameConstraints& constraints, const AlternativeNames& names) {
    return NameConstraintCheck().judge(constraints, names);
}

bool permits(const NameConstraints& constraints, const std::string& name) {
    return judge(constraints, {{name}, {}}) == NameJudgement::permitted;
}

struct SubtreeRow {
    const char* title;
    std::string name;
    std::string subtree;
    bool isPermitted;  // the expected result if the subtree is permitted
    bool isExcluded;   // the expected result if the subtree is excluded
};

class DnsSubtree : public testing::TestWithParam<SubtreeRow> {};

TEST_P(DnsSubtree, HoldsForNamesBelow) {
    const SubtreeRow& row = GetParam();
    EXPECT_EQ(permits(permitted({row.subtree}), row.name), row.isPermitted);
    EXPECT_EQ(!permits(excluded({row.subtree}), row.name), row.isExcluded);
}

INSTANTIATE_TEST_SUITE_P(
    Of, DnsSubtree,
    testing::Values(SubtreeRow{"TheName", "a.example", "a.example", true, true},
                    SubtreeRow{"AnotherCase", "A.Example", "a.EXAMPLE", true, true},
                    SubtreeRow{"ANameBelow", "b.a.example", "a.example", true, true},
                    SubtreeRow{"ANameFarBelow", "c.b.a.example", "example", true, true},
                    SubtreeRow{"TheParent", "example", "a.example", false, false},
                    SubtreeRow{"TheEndOfALabel", "xa.example", "a.example", false, false},
                    SubtreeRow{"AnotherName", "b.example", "a.example", false, false},
                    SubtreeRow{"EveryName", "a.example", "", true, true},
                    SubtreeRow{"ADotAndANameBelow", "b.a.example", ".a.example", true, true},
                    SubtreeRow{"ADotAndTheNameItself", "a.example", ".a.example", false, false},
                    SubtreeRow{"ADotAndTheEndOfALabel", "xa.example", ".a.example", false, false},
                    SubtreeRow{"AWildcardBelow", "*.a.example", "a.example", true, true},
                    SubtreeRow{"AWildcardBelowWithADot", "*.a.example", ".a.example", true, true},
                    SubtreeRow{"AWildcardOfEveryName", "*.a.example", "", true, true},
                    SubtreeRow{"AWildcardThatCoversTheName", "*.example", "a.example", false, true},
                    SubtreeRow{"AWildcardThatCoversTheNameInCapitals", "*.EXAMPLE", "a.example", false, true},
                    SubtreeRow{"AWildcardThatCoversOnlyTheParent", "*.example", "b.a.example", false, false},
                    SubtreeRow{"AWildcardThatCoversNothingBelowTheDot", "*.example", ".a.example", false,
                               false},
                    SubtreeRow{"AWildcardElsewhere", "*.b.example", "a.example", false, false},
                    SubtreeRow{"AnEmptyName", "", "a.example", false, true},
                    SubtreeRow{"AZeroByte", std::string("b.a.example\0", 12), "a.example", false, true},
                    SubtreeRow{"ADotAtTheEnd", "b.a.example.", "a.example", false, true},
                    SubtreeRow{"ABareWildcard", "*", "a.example", false, true},
                    SubtreeRow{"AWildcardInTheMiddle", "b.*.example", "a.example", false, true},
                    SubtreeRow{"ASpace", "b a.example", "a.example", false, true}),
    [](const auto& row) { return row.param.title; });

NameSubtrees::AddressRange range(const Data& base, const Data& mask) {
    return {base, mask};
}

TEST(AddressRange, HoldsForAddressesWithin) {
    NameConstraints constraints;
    constraints.permitted.addresses = {range(bytes({192, 0, 2, 0}), bytes({255, 255, 255, 0}))};
    constraints.excluded.addresses = {range(bytes({192, 0, 2, 128}), bytes({255, 255, 255, 128}))};
    const auto judged = [&](std::initializer_list<unsigned> values) {
        return judge(constraints, {{}, {bytes(values)}});
    };
    EXPECT_EQ(judged({192, 0, 2, 1}), NameJudgement::permitted);
    EXPECT_EQ(judged({192, 0, 2, 127}), NameJudgement::permitted);
    EXPECT_EQ(judged({192, 0, 2, 128}), NameJudgement::excluded);
    EXPECT_EQ(judged({192, 0, 3, 1}), NameJudgement::excluded);
    EXPECT_EQ(judged({0x20, 1, 0xD, 0xB8, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1}), NameJudgement::excluded)
        << "addresses of the other length are of the same form";
    EXPECT_EQ(judge(constraints, {{"a.example"}, {}}), NameJudgement::permitted) << "DNS names are free";
}

TEST(NameConstraints, OfAFormLeaveTheOthersFree) {
    EXPECT_EQ(judge(permitted({"a.example"}), {{}, {bytes({192, 0, 2, 1})}}), NameJudgement::permitted);
}

TEST(NameConstraints, HoldForEveryName) {
    EXPECT_EQ(judge(permitted({"a.example"}), {{"a.example", "b.example"}, {}}), NameJudgement::excluded);
    EXPECT_EQ(judge(permitted({"a.example", "b.example"}), {{"a.example", "b.example"}, {}}),
              NameJudgement::permitted);
    EXPECT_EQ(judge(permitted({"a.example"}), {}), NameJudgement::permitted);
}

TEST(NameConstraints, ExcludeEvenPermittedNames) {
    NameConstraints both = permitted({"example"});
    both.excluded.dnsNames = {"a.example"};
    EXPECT_TRUE(permits(both, "b.example"));
    EXPECT_FALSE(permits(both, "c.a.example"));
}

TEST(NameConstraints, OfAnUnhandledFormAreNotHandled) {
    NameConstraints constraints = permitted({"a.example"});
    constraints.hasUnhandledForm = true;
    EXPECT_EQ(judge(constraints, {{"a.example"}, {}}), NameJudgement::unhandled);
    EXPECT_EQ(judge(constraints, {}), NameJudgement::unhandled);
}

TEST(NameConstraints, HoldForTheHostWhateverCoversIt) {
    const auto host = [](const NameConstraints& constraints, std::string_view name) {
        return NameConstraintCheck().judgeHost(constraints, name) == NameJudgement::permitted;
    };
    EXPECT_FALSE(host(excluded({"a.example"}), "b.a.example"));
    EXPECT_FALSE(host(excluded({"a.example"}), "b.a.example.")) << "with the root's dot";
    EXPECT_TRUE(host(excluded({"a.example"}), "b.example"));
    EXPECT_TRUE(host(permitted({"a.example"}), "192.0.2.1"));
    NameConstraints addresses;
    addresses.excluded.addresses = {range(bytes({192, 0, 2, 0}), bytes({255, 255, 255, 0}))};
    EXPECT_FALSE(host(addresses, "192.0.2.1"));
    EXPECT_TRUE(host(addresses, "a.example"));
}

TEST(NameConstraints, AreComparedUpToABoundAndOnceForEachPair) {
    const NameConstraints constraints = permitted(std::vector<std::string>(1024, "a.example"));
    const AlternativeNames names{std::vector<std::string>(1024, "a.example"), {}};
    const AlternativeNames one{{"a.example"}, {}};
    NameConstraintCheck check;
    for (int i = 0; i < 3; ++i) EXPECT_EQ(check.judge(constraints, names), NameJudgement::permitted);
    EXPECT_EQ(check.judge(constraints, one), NameJudgement::tooMany) << "1024 times 1024 is the bound";
    EXPECT_EQ(check.judge(constraints, names), NameJudgement::permitted) << "known already";
}

}  // namespace
}  // namespace pinwell::trust
