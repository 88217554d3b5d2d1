// Descriptions in other languages and from other databases. The library reads the environment once, at its
// first use. So each case runs in its own process, forked before any other test uses the library: death tests
// come first.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <clocale>
#include <cstdlib>
#include <string>
#include <utility>
#include <vector>

#include "support/temporary_directory.h"
#include "types/type_service.h"

namespace pinwell::types {
namespace {

using Variables = std::vector<std::pair<std::string, std::string>>;

constexpr std::string_view kDescribed = "description: ";

// The description of `name` in a process that has these variables from its start.
void describeAndExit(const Variables& variables, const std::string& name) {
    for (const auto& [key, value] : variables) setenv(key.c_str(), value.c_str(), 1);
    std::setlocale(LC_ALL, "");
    const auto service = makeTypeService();
    const Item item{name, ItemKind::regularFile, false};
    std::fprintf(stderr, "%s%s\n", std::string(kDescribed).c_str(),
                 service->localizedDescription(item).c_str());
    std::_Exit(0);
}

void expectDescription(const Variables& variables, const std::string& name, const std::string& description) {
    // Forked, not started again: the other style would make the test's directories again and leave them.
    GTEST_FLAG_SET(death_test_style, "fast");
    EXPECT_EXIT(describeAndExit(variables, name), testing::ExitedWithCode(0),
                std::string(kDescribed) + description + "\n");
}

// Later versions of the database begin a description with a capital.
TEST(MIMEDescriptionDeathTest, IsEnglishWhateverTheLanguage) {
    expectDescription({{"LANG", "de_DE.UTF-8"}, {"LC_ALL", "de_DE.UTF-8"}, {"LANGUAGE", "de"}}, "a.txt",
                      "[Pp]lain text document");
    expectDescription({{"LANG", "fr_FR.UTF-8"}, {"LANGUAGE", "fr:es"}}, "a.txt", "[Pp]lain text document");
}

// A database with one type of its own, whose translation is before its English name.
class OwnDatabase {
  public:
    OwnDatabase() {
        test::writeFile(directory_ / "mime/globs2", "50:application/x-sample:*.zzsample\n");
        test::writeFile(directory_ / "mime/application/x-sample.xml",
                        "<?xml version=\"1.0\"?>\n"
                        "<mime-type xmlns=\"http://example.test/info\" type=\"application/x-sample\">"
                        "<comment xml:lang=\"de\">Musterdatei</comment><comment>sample file</comment>"
                        "<acronym>S</acronym><glob pattern=\"*.zzsample\"/></mime-type>");
    }

    Variables variables() const {
        return {
            {"XDG_DATA_HOME", directory_.path()}, {"XDG_DATA_DIRS", directory_ / "none"}, {"LANGUAGE", "de"}};
    }
    void rewriteType(std::string_view contents) {
        test::writeFile(directory_ / "mime/application/x-sample.xml", contents);
    }

  private:
    test::TemporaryDirectory directory_;
};

TEST(MIMEDescriptionDeathTest, IsTheUntranslatedComment) {
    const OwnDatabase database;
    expectDescription(database.variables(), "a.ZZSample", "sample file");
}

TEST(MIMEDescriptionDeathTest, IsTheGeneralOneWhenTheDatabaseIsMalformed) {
    OwnDatabase database;
    for (const std::string_view contents : {"", "junk", "<mime-type><comment>sample", "<mime-type/>",
                                            "<mime-type><comment></comment></mime-type>"}) {
        database.rewriteType(contents);
        expectDescription(database.variables(), "a.zzsample", "document");
    }
}

TEST(MIMEDescriptionDeathTest, IsTheGeneralOneWithoutADatabase) {
    const test::TemporaryDirectory empty;
    expectDescription({{"XDG_DATA_HOME", empty.path()}, {"XDG_DATA_DIRS", empty / "none"}}, "a.txt",
                      "document");
}

}  // namespace
}  // namespace pinwell::types
