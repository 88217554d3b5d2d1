#include "schema_validation.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "support/process.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

class ConformingDocuments : public testing::Environment {
  public:
    void add(const std::string& document, const std::string& schema) {
        auto& documents = bySchema_[schema];
        const testing::TestInfo& test = *testing::UnitTest::GetInstance()->current_test_info();
        std::string name = std::string(test.test_suite_name()) + "." + test.name();
        std::replace(name.begin(), name.end(), '/', '_');
        documents[name + "-" + std::to_string(documents.size())] = document;
    }

    void TearDown() override {
        for (const auto& [schema, documents] : bySchema_) EXPECT_EQ(refusalsOf(documents, schema), "");
    }

  private:
    std::map<std::string, std::map<std::string, std::string>> bySchema_;
};

// GoogleTest owns it.
auto* const conformingDocuments =
    static_cast<ConformingDocuments*>(testing::AddGlobalTestEnvironment(new ConformingDocuments));

}  // namespace

void expectConforms(const std::string& document, const std::string& schema) {
    conformingDocuments->add(document, schema);
}

std::string refusalsOf(const std::map<std::string, std::string>& documents, const std::string& schema) {
    const TemporaryDirectory directory;
    Command check;
    check.executable = JSONSCHEMA_PROGRAM;
    check.arguments = {"--output", "pretty"};
    check.environment = {{"PATH", "/usr/bin:/bin"}, {"LC_ALL", "C.UTF-8"}};
    check.workingDirectory = directory.path();
    for (const auto& [name, document] : documents) {
        writeFile(directory / name, std::string_view(document));
        check.arguments.insert(check.arguments.end(), {"-i", name});
    }
    check.arguments.push_back(schema);
    const ProcessResult result = runProcess(check);
    if (result.exitStatus == 0) return {};
    return result.errors.empty() ? "the validator fails: " + result.output : result.errors;
}

std::string refusalOf(const std::string& name) {
    return "===[ValidationError]===(" + name + ")===";
}

}  // namespace pinwell::test
