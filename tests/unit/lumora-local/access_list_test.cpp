#include "lumora-local/access_list.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include "lumora-local/failure.h"
#include "support/temporary_directory.h"
#include "support/text.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;

class AccessListTest : public testing::Test {
  protected:
    void write(const std::string& text) const { writeFile(path_, text); }

    /// The complaint about a file with this text.
    std::string faultOf(const std::string& text) const {
        write(text);
        try {
            readAccessFile(path_);
        } catch (const Failure& failure) {
            EXPECT_EQ(failure.exitStatus(), EX_CONFIG);
            EXPECT_EQ(std::string(failure.what()).find('\n'), std::string::npos);
            return failure.what();
        }
        return "none";
    }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "access.toml";
};

TEST_F(AccessListTest, GivesClientsTheirRoles) {
    write("[clients]\n\"ci.example\" = [\"issue\", \"read\"]\n\"R\u00fcdiger B\" = [\"revoke\"]\n");
    const AccessList list(path_);
    EXPECT_EQ(list.of("ci.example"), (Rights{true, false, true}));
    EXPECT_EQ(list.of("R\u00fcdiger B"), (Rights{false, true, false}));
}

TEST_F(AccessListTest, GivesNoRoleToUnlistedClients) {
    write("[clients]\n\"ci.example\" = [\"issue\"]\n");
    const AccessList list(path_);
    for (const char* name : {"", "ci", "CI.EXAMPLE", "ci.example ", "clients"})
        EXPECT_FALSE(list.of(name).any()) << name;
}

TEST_F(AccessListTest, MayBeEmpty) {
    write("");
    EXPECT_FALSE(AccessList(path_).of("ci.example").any());
    write("[clients]\n");
    EXPECT_FALSE(AccessList(path_).of("ci.example").any());
}

TEST_F(AccessListTest, NamesTheFileAndTheLineOfAFault) {
    EXPECT_EQ(faultOf("[clients]\n\"a\" = [\"isue\"]\n"),
              path_ + ":2: a role is \"issue\", \"revoke\" or \"read\"");
    EXPECT_EQ(faultOf("[clients]\n\"a\" = []\n"), path_ + ":2: \"a\" has no role");
    EXPECT_EQ(faultOf("[clients]\n\n\"\" = [\"read\"]\n"),
              path_ + ":3: a client's name has 1 to 64 bytes, as a common name has");
    EXPECT_EQ(faultOf("[client]\n"), path_ + ":1: unknown key \"client\"; there is [clients]");
    EXPECT_EQ(faultOf("clients = 1\n"), path_ + ":1: clients is no table");
}

TEST_F(AccessListTest, NamesAClientThatIsListedTwice) {
    EXPECT_EQ(faultOf("[clients]\n\"ci.example\" = [\"read\"]\n\"ci.example\" = [\"issue\"]\n"),
              path_ + ":3: a client is there twice");
}

TEST_F(AccessListTest, RefusesSpecialFiles) {
    ASSERT_EQ(::mkfifo(path_.c_str(), 0600), 0);
    try {
        readAccessFile(path_);
        FAIL() << "a FIFO was read";
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.what(), path_ + ": it is not a regular file");
    }
}

TEST_F(AccessListTest, RefusesValuesOtherThanListsOfRoles) {
    for (const char* value : {"\"read\"", "true", "1", "[1]", "[[\"read\"]]", "{}", "[\"read\", \"Read\"]"}) {
        EXPECT_NE(faultOf(std::string("[clients]\n\"a\" = ") + value + "\n").find(path_ + ":2: "),
                  std::string::npos)
            << value;
    }
}

TEST_F(AccessListTest, RequiresQuotesAroundANameWithDots) {
    EXPECT_NE(faultOf("[clients]\nci.example = [\"read\"]\n").find("a name with dots is in quotes"),
              std::string::npos);
}

TEST_F(AccessListTest, RefusesTextThatIsNotToml) {
    EXPECT_NE(faultOf("[clients\n").find(path_ + ":1: "), std::string::npos);
    EXPECT_NE(faultOf("[clients]\n\"a\" = [\"read\"]\n\"a\" = [\"issue\"]\n").find(path_ + ":3: "),
              std::string::npos);
    EXPECT_NE(faultOf(std::string("\xff\xfe")).find(path_ + ":1: "), std::string::npos);
}

TEST_F(AccessListTest, RefusesKeysOfManyPartsBeforeTheyAreParsed) {
    std::string key = "a";
    for (int i = 0; i < 200'000; ++i) key += ".a";
    EXPECT_EQ(faultOf("[" + key + "]\n"), path_ + ":1: a key of more than 4 parts");
}

TEST_F(AccessListTest, RefusesMoreClientsThanItsBound) {
    std::string text = "[clients]\n";
    for (int i = 0; i <= 10'000; ++i) text += "c" + std::to_string(i) + " = [\"read\"]\n";
    EXPECT_NE(faultOf(text).find("more than 10000 clients"), std::string::npos);
}

TEST_F(AccessListTest, RefusesAMissingOrTooLargeFile) {
    EXPECT_THROW(readAccessFile(directory_ / "nothing"), Failure);
    EXPECT_NE(faultOf(std::string(2 * 1024 * 1024, '#')), "none");
}

TEST_F(AccessListTest, ReadsItsFileAgain) {
    write("[clients]\na = [\"read\"]\n");
    AccessList list(path_);
    write("[clients]\nb = [\"read\"]\n");
    EXPECT_TRUE(list.of("a").any());
    list.reload();
    EXPECT_FALSE(list.of("a").any());
    EXPECT_TRUE(list.of("b").any());
}

TEST_F(AccessListTest, KeepsItsRolesIfTheNewFileIsUnusable) {
    write("[clients]\na = [\"read\"]\n");
    AccessList list(path_);
    write("[clients]\nb = 1\n");
    EXPECT_THROW(list.reload(), Failure);
    EXPECT_TRUE(list.of("a").any());
    EXPECT_FALSE(list.of("b").any());
}

}  // namespace
}  // namespace pinwell::lumora
