// Bundles with one part behind a link that leads out of the bundle. The part counts as missing, and nothing
// is written at the link's target. Everything else is valid.
#include <gtest/gtest.h>

#include <filesystem>
#include <functional>
#include <map>
#include <tuple>

#include "base/bytes.h"
#include "e2e/artefacts.h"
#include "result_table.h"
#include "subjects.h"
#include "support/code_directory_builder.h"
#include "support/controller_run.h"
#include "support/executable_image_builder.h"

namespace pinwell::test {
namespace {

namespace fs = std::filesystem;

constexpr int kUnsigned = 66;    // no hash is found
constexpr int kNoTicket = 65;    // none is stapled to it
constexpr int kNotWritten = 73;  // the ticket cannot be written there

/// Which link takes the part's place.
enum class Form { relative, absolute, throughAnother, outAndBackIn, staying };

const char* nameOf(Form form) {
    switch (form) {
        case Form::relative:
            return "Relative";
        case Form::absolute:
            return "Absolute";
        case Form::throughAnother:
            return "ThroughAnother";
        case Form::outAndBackIn:
            return "OutAndBackIn";
        case Form::staying:
            return "Staying";
    }
    return "";
}

const char* describe(Form form) {
    switch (form) {
        case Form::relative:
            return "a relative link out of the bundle";
        case Form::absolute:
            return "an absolute link out of the bundle";
        case Form::throughAnother:
            return "a link to a link out of the bundle";
        case Form::outAndBackIn:
            return "a link out of the bundle and back into it";
        case Form::staying:
            return "a link that stays in the bundle, which is allowed";
    }
    return "";
}

Data directoryBlob() {
    return CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
}
Data image() {
    return ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(directoryBlob()).build()).build();
}

// Kinds of bundle, all with the same hash.

void application(const std::string& path) {
    BundleBuilder().executableName("tool").executable(image()).write(path);
}
void separatelySigned(const std::string& path) {
    BundleBuilder()
        .executableName("tool")
        .executable(base::toData("#!/bin/sh\n"))
        .separateSignature(directoryBlob(), emptyRequirements(), {})
        .write(path);
}
void framework(const std::string& path) {
    const Data executable = image();
    // A directory where others have a link: after a move it still leads to the executable.
    writeFile(path + "/Versions/Current/Sample", base::ByteView(executable));
}

struct Part {
    const char* name;
    const char* place;     // below the bundle
    const char* fileName;  // of the bundle
    void (*write)(const std::string& bundle);
    int validates;  // the exit code of a validation
    int staples;
    bool mayStay = true;  // whether a link that stays in the bundle is followed there
};

const std::vector<Part>& parts() {
    static const std::vector<Part> all{
        {"Contents", "Contents", "Sample.app", application, kUnsigned, kUnsigned},
        {"PropertyList", "Contents/Info.plist", "Sample.app", application, kUnsigned, kUnsigned},
        {"ExecutableDirectory", "Contents/Programs", "Sample.app", application, kUnsigned, kUnsigned, false},
        {"Executable", "Contents/Programs/tool", "Sample.app", application, kUnsigned, kUnsigned, false},
        {"Ticket", "Contents/CodeResources", "Sample.app", application, kNoTicket, kNotWritten, false},
        {"SeparateSignature", "Contents/_CodeSignature", "Sample.bundle", separatelySigned, kUnsigned,
         kUnsigned},
        {"SeparateDirectory", "Contents/_CodeSignature/CodeDirectory", "Sample.bundle", separatelySigned,
         kUnsigned, kUnsigned, false},
        {"Versions", "Versions", "Sample.framework", framework, kUnsigned, kUnsigned},
        {"CurrentVersion", "Versions/Current", "Sample.framework", framework, kUnsigned, kUnsigned},
    };
    return all;
}

/// All files below the directory, by path, with their bytes.
std::map<std::string, std::string> snapshot(const std::string& directory) {
    std::map<std::string, std::string> files;
    for (const auto& entry : fs::recursive_directory_iterator(directory))
        files[entry.path().native()] =
            entry.is_regular_file() && !entry.is_symlink() ? readFile(entry.path()) : std::string();
    return files;
}

/// Moves the part away and replaces it by a link of that form.
void replaceByLink(const std::string& bundle, const std::string& outside, const std::string& place,
                   Form form) {
    const fs::path part = fs::path(bundle) / place;
    const bool stays = form == Form::outAndBackIn || form == Form::staying;
    const fs::path kept = fs::path(stays ? bundle + "/kept" : outside) / place;
    fs::create_directories(kept.parent_path());
    fs::rename(part, kept);

    fs::path target = fs::relative(kept, part.parent_path());
    if (form == Form::absolute) target = kept;
    if (form == Form::outAndBackIn) {
        const fs::path above = fs::relative(fs::path(bundle).parent_path(), part.parent_path());
        target = above / fs::path(bundle).filename() / "kept" / place;
    }
    if (form == Form::throughAnother) {
        fs::create_symlink(kept, bundle + "/hop");
        // Computed from the text alone: it refers to the link itself.
        target = fs::path(bundle + "/hop").lexically_relative(part.parent_path());
    }
    fs::create_symlink(target, part);
}

class LinkTable : public testing::TestWithParam<std::tuple<Part, Form>> {
  protected:
    LinkTable() : tool_({{chain().root.der}, {}, {}, {}}) {
        bundle_ = tool_.path(std::string("builds/") + part().fileName);
        outside_ = tool_.path("elsewhere");
        fs::create_directory(outside_);
        part().write(bundle_);
        const Data ticket = good();
        writeFile(bundle_ + "/Contents/CodeResources", base::ByteView(ticket));
    }

    static const Part& part() { return std::get<Part>(GetParam()); }
    static Form form() { return std::get<Form>(GetParam()); }

    static const IssuedChain& chain() {
        static const IssuedChain issued = TicketChain().issue();
        return issued;
    }
    static Data good() {
        const Data payload = TicketPayloadBuilder().entry(2, codeHashOf(2, directoryBlob())).build();
        return SatchelBuilder::of(chain(), payload).build();
    }
    static std::string answer() { return ControllerRun::inlineAnswer(good()); }

    void expect(const char* operation, int expected, int got) {
        EXPECT_EQ(got, expected) << part().place << " is " << describe(form());
        recordResult({"links", std::string(part().name) + "_" + nameOf(form()) + "_" + operation,
                      std::string(part().place) + " is " + describe(form()), std::to_string(expected),
                      std::to_string(got), form() != Form::staying});
    }

    ToolRun tool_;
    std::string bundle_;
    std::string outside_;
};

std::string nameOfCase(const testing::TestParamInfo<std::tuple<Part, Form>>& tested) {
    return std::string(std::get<Part>(tested.param).name) + "_" + nameOf(std::get<Form>(tested.param));
}

TEST_P(LinkTable, EndsWithItsExitCode) {
    replaceByLink(bundle_, outside_, part().place, form());
    const auto before = snapshot(outside_);
    if (form() == Form::staying) {
        expect("Validate", 0, tool_.validate(bundle_, answer()));
        expect("Staple", 0, tool_.staple(bundle_, answer()));
    } else {
        expect("Validate", part().validates, tool_.validate(bundle_, answer()));
        expect("Staple", part().staples, tool_.staple(bundle_, answer()));
    }
    EXPECT_EQ(snapshot(outside_), before);
}

INSTANTIATE_TEST_SUITE_P(MustFail, LinkTable,
                         testing::Combine(testing::ValuesIn(parts()),
                                          testing::Values(Form::relative, Form::absolute,
                                                          Form::throughAnother, Form::outAndBackIn)),
                         nameOfCase);

std::vector<Part> partsThatMayStay() {
    std::vector<Part> some;
    for (const Part& one : parts())
        if (one.mayStay) some.push_back(one);
    return some;
}
INSTANTIATE_TEST_SUITE_P(Accepted, LinkTable,
                         testing::Combine(testing::ValuesIn(partsThatMayStay()),
                                          testing::Values(Form::staying)),
                         nameOfCase);

/// A link that replaces a directory during the lookup.
class LateLinkTable : public LinkTable {};

TEST_P(LateLinkTable, EndsWithItsExitCode) {
    std::map<std::string, std::string> before;
    const int got = tool_.staple(bundle_, answer(), [&] {
        replaceByLink(bundle_, outside_, part().place, form());
        before = snapshot(outside_);
    });
    expect("WhileStapling", kNotWritten, got);
    EXPECT_EQ(snapshot(outside_), before);
}

INSTANTIATE_TEST_SUITE_P(MustFail, LateLinkTable,
                         testing::Combine(testing::Values(parts()[0], parts()[4]),
                                          testing::Values(Form::relative, Form::absolute,
                                                          Form::throughAnother, Form::outAndBackIn)),
                         nameOfCase);

}  // namespace
}  // namespace pinwell::test
