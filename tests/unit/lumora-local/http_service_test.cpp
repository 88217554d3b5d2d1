#include "lumora-local/http_service.h"

#include <gtest/gtest.h>

#include "values/url.h"

namespace pinwell::lumora {
namespace {

TEST(Query, IsEmptyWithoutAQuery) {
    EXPECT_EQ(parseQuery("/v1/records"), Query{});
    EXPECT_EQ(parseQuery("/v1/records?"), Query{});
    EXPECT_EQ(parseQuery("/v1/records#?a=b"), Query{});
    EXPECT_EQ(parseQuery("/?&&"), Query{});
}

TEST(Query, HasNamesAndValuesDecoded) {
    EXPECT_EQ(parseQuery("/?name=2%2F2%2fab&label=caf%C3%A9+one%2B&empty=&bare#end"),
              (Query{{"name", "2/2/ab"}, {"label", "caf\u00e9 one+"}, {"empty", ""}, {"bare", ""}}));
    EXPECT_EQ(parseQuery("/?a=b=c?d"), (Query{{"a", "b=c?d"}}));
}

TEST(Query, IsRefusedIfItIsMalformed) {
    for (const char* target : {"/?a=%", "/?a=%4", "/?a=%zz", "/?%=1", "/?=1", "/?a=1&a=2", "/?a=%00",
                               "/?a=%FF", "/?%E9=1", "/?a=%C3"}) {
        EXPECT_EQ(parseQuery(target), std::nullopt) << target;
    }
}

TEST(Query, RoundTripsThroughEncoding) {
    std::string all;
    for (int c = 0; c < 256; ++c) all += static_cast<char>(c);
    const std::string encoded = values::percentEncoded(all);
    EXPECT_EQ(percentDecoded(encoded), all);
    EXPECT_EQ(encoded.find_first_of("\"<>&'/?#+ "), std::string::npos);
    EXPECT_EQ(values::percentEncoded("2/2/a-z_.~"), "2%2F2%2Fa-z_.~");
}

}  // namespace
}  // namespace pinwell::lumora
