// The C interface with wrong arguments, and with invalid handles.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <climits>
#include <filesystem>
#include <limits>

#include "c_handles.h"
#include "vector_artefacts.h"

namespace pinwell::test {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

const std::string kSample = VECTORS_DIRECTORY "/artefacts/Sample.app";

class CInterface : public testing::Test {
  protected:
    pinwell_status judge(const char* path, std::size_t length) {
        return pinwell_judge_file(path, length, roots.get(), nullptr, &result, &error);
    }

    const CRoots roots = cRoots(VectorArtefacts::platform());
    pinwell_result* result = reinterpret_cast<pinwell_result*>(std::uintptr_t{1});
    pinwell_error error = PINWELL_ERROR_INIT;
    TemporaryDirectory directory;
};

TEST_F(CInterface, HasTheVersionOfItsHeader) {
    EXPECT_EQ(pinwell_version(), static_cast<std::uint32_t>(PINWELL_TICKET_VERSION));
}

TEST_F(CInterface, NamesEveryNumber) {
    for (pinwell_status status = PINWELL_OK; status <= PINWELL_ERROR_INTERNAL; ++status)
        EXPECT_STRNE(pinwell_error_text(status), "an unknown status") << status;
    for (const std::int32_t number : {-1, 99, INT_MIN, INT_MAX}) {
        EXPECT_STREQ(pinwell_error_text(number), "an unknown status");
        EXPECT_STREQ(pinwell_kind_text(number), "none");
        EXPECT_STREQ(pinwell_verdict_text(number), "none");
        EXPECT_STREQ(pinwell_outcome_text(number), "none");
    }
    EXPECT_STREQ(pinwell_kind_text(PINWELL_KIND_DISK_IMAGE), "diskImage");
    EXPECT_STREQ(pinwell_verdict_text(PINWELL_VERDICT_NO_TICKET), "noTicket");
    EXPECT_STREQ(pinwell_outcome_text(PINWELL_OUTCOME_FAILED), "failed");
}

// Paths.

TEST_F(CInterface, RefusesAPathThatIsNone) {
    EXPECT_EQ(judge(nullptr, 5), PINWELL_ERROR_ARGUMENT);
    EXPECT_STREQ(error.message, "there is no path");
    EXPECT_EQ(result, nullptr);
    EXPECT_EQ(judge("", 0), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(judge("", PINWELL_NUL_TERMINATED), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(judge("Sample\0.app", 11), PINWELL_ERROR_ARGUMENT);
    EXPECT_STREQ(error.message, "there is a zero byte in the path");
}

TEST_F(CInterface, TakesNoMoreOfAPathThanItsLength) {
    const std::string longer = kSample + "/Contents";
    ASSERT_EQ(judge(longer.c_str(), kSample.size()), PINWELL_OK);
    EXPECT_EQ(pinwell_result_verdict(result), PINWELL_VERDICT_GOOD);
    pinwell_result_free(result);
}

TEST_F(CInterface, HasAVerdictForEveryPath) {
    ASSERT_EQ(mkfifo((directory / "fifo.dmg").c_str(), 0600), 0);
    std::filesystem::create_symlink(kSample, directory / "link.app");
    for (const std::string& path :
         {directory / "missing", directory.path(), directory / "fifo.dmg", directory / "link.app",
          std::string("/dev/null"), std::string("/dev/zero"), std::string("/proc/self/mem"), std::string("/"),
          std::string("."), std::string("\xff\xfe\n"), std::string(5000, 'x'),
          std::string(300, 'x') + ".dmg"}) {
        const CResult found = judged(path, roots);
        EXPECT_EQ(pinwell_result_verdict(found.get()), PINWELL_VERDICT_UNREADABLE) << path;
        EXPECT_EQ(pinwell_result_exit_status(found.get()), 66);
        EXPECT_EQ(pinwell_result_code_hash(found.get(), nullptr), nullptr);
        EXPECT_EQ(pinwell_result_verdict(verified(path, roots).get()), PINWELL_VERDICT_UNREADABLE) << path;
    }
}

TEST_F(CInterface, SaysWhyAFileCannotBeReadWithItsErrno) {
    pinwell_ticket* ticket = nullptr;
    const std::string missing = directory / "missing.dmg";
    EXPECT_EQ(pinwell_find_ticket(missing.c_str(), missing.size(), &ticket, &error),
              PINWELL_ERROR_UNREADABLE);
    EXPECT_EQ(error.system_error, ENOENT);
    EXPECT_EQ(error.status, PINWELL_ERROR_UNREADABLE);
    char name[PINWELL_RECORD_NAME_SIZE];
    EXPECT_EQ(
        pinwell_record_name_of_file(missing.c_str(), missing.size(), name, sizeof name, nullptr, &error),
        PINWELL_ERROR_UNREADABLE);
}

TEST_F(CInterface, SaysWhereAnImageIsMalformed) {
    const std::string image = directory / "short.dmg";
    writeFile(image, std::string(1000, 'x'));
    pinwell_ticket* ticket = nullptr;
    EXPECT_EQ(pinwell_find_ticket(image.c_str(), image.size(), &ticket, &error), PINWELL_ERROR_MALFORMED);
    EXPECT_EQ(error.offset, 1000U - 512U);
    EXPECT_STREQ(error.message, "the file does not end in a disk image's trailer");
}

// Structures.

TEST_F(CInterface, RefusesStructuresOfAnUnknownSize) {
    for (const std::size_t size : {std::size_t{0}, std::size_t{1}, sizeof(pinwell_error) - 1}) {
        error.struct_size = size;
        error.status = 77;
        EXPECT_EQ(judge(kSample.c_str(), kSample.size()), PINWELL_ERROR_ARGUMENT);
        EXPECT_EQ(error.status, 77) << "written to";
        EXPECT_EQ(result, nullptr);
    }
    pinwell_options options = PINWELL_OPTIONS_INIT;
    options.struct_size -= 1;
    EXPECT_EQ(pinwell_judge_file(kSample.c_str(), kSample.size(), roots.get(), &options, &result, nullptr),
              PINWELL_ERROR_ARGUMENT);
    const CResult sample = judged(kSample, roots);
    pinwell_check check = PINWELL_CHECK_INIT;
    check.struct_size -= 1;
    EXPECT_EQ(pinwell_result_check(sample.get(), 0, &check), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(check.name, nullptr);
}

TEST_F(CInterface, FillsNoMoreOfALaterStructureThanItKnows) {
    struct {
        pinwell_check known = PINWELL_CHECK_INIT;
        std::uint64_t later = 0x0123456789abcdef;
    } check;
    check.known.struct_size = sizeof check;
    const CResult sample = judged(kSample, roots);
    EXPECT_EQ(pinwell_result_check(sample.get(), 0, &check.known), PINWELL_OK);
    EXPECT_STREQ(check.known.name, "ticket-stapled");
    EXPECT_EQ(check.later, 0x0123456789abcdefU);
    EXPECT_EQ(check.known.struct_size, sizeof check);
}

TEST_F(CInterface, RefusesOptionsThatItDoesNotKnow) {
    pinwell_options options = PINWELL_OPTIONS_INIT;
    options.reserved = 1;
    EXPECT_EQ(pinwell_verify_file(kSample.c_str(), kSample.size(), roots.get(), &options, &result, &error),
              PINWELL_ERROR_ARGUMENT);
    options = PINWELL_OPTIONS_INIT;
    options.threads = 1025;
    EXPECT_EQ(pinwell_verify_file(kSample.c_str(), kSample.size(), roots.get(), &options, &result, &error),
              PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(result, nullptr);
}

TEST_F(CInterface, JudgesATicketAlikeAtEveryTime) {
    pinwell_options options = PINWELL_OPTIONS_INIT;
    for (const std::int64_t time : {INT64_MIN + 1, INT64_C(0), INT64_C(4102444800), INT64_MAX}) {
        options.evaluation_time = time;
        const CResult found = verified(kSample, roots, &options);
        EXPECT_EQ(pinwell_result_verdict(found.get()), PINWELL_VERDICT_GOOD) << time;
    }
}

TEST_F(CInterface, EscapesCharactersThatDriveATerminal) {
    const std::string path = directory / "\x1b[31m.dmg";
    writeFile(path, std::string("x"));
    pinwell_ticket* ticket = nullptr;
    EXPECT_NE(pinwell_find_ticket(path.c_str(), path.size(), &ticket, &error), PINWELL_OK);
    EXPECT_EQ(std::string(error.message).find('\x1b'), std::string::npos);
}

// Handles.

TEST_F(CInterface, RefusesHandlesThatAreNone) {
    int object = 0;
    const std::uintptr_t numbers[] = {0,
                                      1,
                                      8,
                                      0x10001,
                                      std::numeric_limits<std::uintptr_t>::max(),
                                      reinterpret_cast<std::uintptr_t>(&object)};
    for (const std::uintptr_t number : numbers) {
        auto* const noResult = reinterpret_cast<pinwell_result*>(number);
        auto* const noTicket = reinterpret_cast<pinwell_ticket*>(number);
        auto* const noRoots = reinterpret_cast<pinwell_roots*>(number);
        std::size_t length = 99;
        pinwell_check check = PINWELL_CHECK_INIT;
        EXPECT_EQ(pinwell_result_verdict(noResult), PINWELL_VERDICT_NONE);
        EXPECT_EQ(pinwell_result_kind(noResult), PINWELL_KIND_NONE);
        EXPECT_EQ(pinwell_result_exit_status(noResult), 70);
        EXPECT_EQ(pinwell_result_reason(noResult, &length), nullptr);
        EXPECT_EQ(length, 0U);
        EXPECT_EQ(pinwell_result_record_name(noResult, nullptr), nullptr);
        EXPECT_EQ(pinwell_result_code_hash(noResult, nullptr), nullptr);
        EXPECT_EQ(pinwell_result_digest_type(noResult), 0U);
        EXPECT_EQ(pinwell_result_ticket(noResult, nullptr), nullptr);
        EXPECT_EQ(pinwell_result_check_count(noResult), 0U);
        EXPECT_EQ(pinwell_result_check(noResult, 0, &check), PINWELL_ERROR_HANDLE);
        EXPECT_EQ(pinwell_ticket_bytes(noTicket, nullptr), nullptr);
        EXPECT_EQ(pinwell_ticket_file(noTicket, nullptr), nullptr);
        EXPECT_EQ(pinwell_ticket_offset(noTicket), 0U);
        EXPECT_EQ(pinwell_roots_count(noRoots), 0U);
        EXPECT_EQ(pinwell_roots_problem_count(noRoots), 0U);
        EXPECT_EQ(pinwell_roots_problem(noRoots, 0, nullptr), nullptr);
        EXPECT_EQ(pinwell_judge_file(kSample.c_str(), kSample.size(), noRoots, nullptr, &result, &error),
                  PINWELL_ERROR_HANDLE);
        EXPECT_EQ(result, nullptr);
        const pinwell_status freed = number == 0 ? PINWELL_OK : PINWELL_ERROR_HANDLE;
        EXPECT_EQ(pinwell_result_free(noResult), freed);
        EXPECT_EQ(pinwell_ticket_free(noTicket), freed);
        EXPECT_EQ(pinwell_roots_free(noRoots), freed);
    }
}

TEST_F(CInterface, RecognisesAHandleThatWasFreed) {
    ASSERT_EQ(judge(kSample.c_str(), kSample.size()), PINWELL_OK);
    pinwell_result* const freed = result;
    EXPECT_EQ(pinwell_result_free(freed), PINWELL_OK);
    // Its memory may belong to another handle now; its number does not.
    ASSERT_EQ(judge(kSample.c_str(), kSample.size()), PINWELL_OK);
    EXPECT_NE(result, freed);
    EXPECT_EQ(pinwell_result_verdict(freed), PINWELL_VERDICT_NONE);
    EXPECT_EQ(pinwell_result_free(freed), PINWELL_ERROR_HANDLE);
    EXPECT_EQ(pinwell_result_free(result), PINWELL_OK);
}

TEST_F(CInterface, RecognisesAHandleOfAnotherType) {
    ASSERT_EQ(judge(kSample.c_str(), kSample.size()), PINWELL_OK);
    EXPECT_EQ(pinwell_ticket_bytes(reinterpret_cast<pinwell_ticket*>(result), nullptr), nullptr);
    EXPECT_EQ(pinwell_roots_free(reinterpret_cast<pinwell_roots*>(result)), PINWELL_ERROR_HANDLE);
    EXPECT_EQ(pinwell_result_verdict(result), PINWELL_VERDICT_GOOD);
    pinwell_result_free(result);
}

TEST_F(CInterface, KeepsTheNeededPartsOfFreedRoots) {
    CRoots temporary = cRoots(VectorArtefacts::platform());
    const CResult found = judged(kSample, temporary);
    temporary.reset();
    EXPECT_EQ(pinwell_result_verdict(found.get()), PINWELL_VERDICT_GOOD);
    EXPECT_NE(textOf(pinwell_result_ticket, found), "");
}

TEST_F(CInterface, NeedsAPlaceForEachHandle) {
    EXPECT_EQ(pinwell_judge_file(kSample.c_str(), kSample.size(), roots.get(), nullptr, nullptr, &error),
              PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_find_ticket(kSample.c_str(), kSample.size(), nullptr, &error), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_roots_from_directory("/", 1, nullptr, &error), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_roots_from_certificates("x", 1, nullptr, &error), PINWELL_ERROR_ARGUMENT);
    const CResult found = judged(kSample, roots);
    EXPECT_EQ(pinwell_result_check(found.get(), 0, nullptr), PINWELL_ERROR_ARGUMENT);
    pinwell_check check = PINWELL_CHECK_INIT;
    EXPECT_EQ(pinwell_result_check(found.get(), pinwell_result_check_count(found.get()), &check),
              PINWELL_ERROR_RANGE);
    EXPECT_EQ(pinwell_result_check(found.get(), SIZE_MAX, &check), PINWELL_ERROR_RANGE);
}

// Roots.

TEST_F(CInterface, TakesRootsFromPemAndReportsOtherText) {
    const std::string pem = readFile(VectorArtefacts::platform() + "/roots/sample.pem");
    pinwell_roots* made = nullptr;
    ASSERT_EQ(pinwell_roots_from_certificates(pem.data(), pem.size(), &made, &error), PINWELL_OK);
    EXPECT_EQ(pinwell_roots_count(made), 1U);
    EXPECT_EQ(pinwell_result_verdict(judged(kSample, CRoots(made)).get()), PINWELL_VERDICT_GOOD);
    for (const std::string& text : {std::string(), std::string("x"), pem.substr(0, pem.size() / 2)}) {
        EXPECT_EQ(pinwell_roots_from_certificates(text.data(), text.size(), &made, &error),
                  PINWELL_ERROR_NO_CERTIFICATES);
        EXPECT_EQ(made, nullptr);
    }
    EXPECT_EQ(pinwell_roots_from_certificates(nullptr, 0, &made, &error), PINWELL_ERROR_NO_CERTIFICATES);
    EXPECT_EQ(pinwell_roots_from_certificates(nullptr, 1, &made, &error), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_roots_from_certificates(pem.data(), SIZE_MAX, &made, &error), PINWELL_ERROR_ARGUMENT);
}

TEST_F(CInterface, TrustsNothingWithoutRoots) {
    const CRoots none = cRoots(directory / "missing");
    EXPECT_EQ(pinwell_roots_count(none.get()), 0U);
    const CResult found = judged(kSample, none);
    EXPECT_EQ(pinwell_result_verdict(found.get()), PINWELL_VERDICT_REFUSED);
}

TEST_F(CInterface, SaysWhyATicketIsRefused) {
    const VectorArtefacts& artefacts = VectorArtefacts::shared();
    const auto reason = [&](std::string_view name) {
        const CResult found = judged(artefacts.named(name), roots);
        EXPECT_EQ(pinwell_result_verdict(found.get()), PINWELL_VERDICT_REFUSED);
        EXPECT_EQ(textOf(pinwell_result_reason, verified(artefacts.named(name), roots)),
                  textOf(pinwell_result_reason, found));
        return textOf(pinwell_result_reason, found);
    };
    EXPECT_EQ(reason("an application whose ticket differs in its last byte"),
              "Its ticket is not acceptable: the signature does not verify.");
    EXPECT_EQ(reason("an application with a stale ticket, which lists other software"),
              "Its ticket is not acceptable: the ticket does not list this artefact.");
    EXPECT_THAT(reason("an application with a ticket of another authority"),
                StartsWith("Its ticket is not acceptable: "));
}

TEST_F(CInterface, NamesRootsThatItLeavesOut) {
    writeFile(directory / "roots/bad.pem", std::string_view("no certificate\n"));
    const CRoots some = cRoots(directory.path());
    ASSERT_EQ(pinwell_roots_problem_count(some.get()), 1U);
    std::size_t length = 0;
    const char* const problem = pinwell_roots_problem(some.get(), 0, &length);
    EXPECT_THAT(std::string(problem, length), HasSubstr("bad.pem"));
    EXPECT_EQ(problem[length], '\0');
    EXPECT_EQ(pinwell_roots_problem(some.get(), 1, &length), nullptr);
    EXPECT_EQ(length, 0U);
}

// Names of records.

TEST_F(CInterface, NamesTheRecordOfAHash) {
    const unsigned char hash[] = {0x00, 0x0a, 0xff};
    char name[PINWELL_RECORD_NAME_SIZE];
    std::size_t length = 0;
    ASSERT_EQ(pinwell_record_name(2, hash, sizeof hash, name, sizeof name, &length, &error), PINWELL_OK);
    EXPECT_STREQ(name, "2/2/000aff");
    EXPECT_EQ(length, 10U);
    ASSERT_EQ(pinwell_record_name(0, hash, sizeof hash, name, sizeof name, nullptr, nullptr), PINWELL_OK);
    EXPECT_STREQ(name, "1/000aff");
    EXPECT_EQ(pinwell_record_name(2, hash, 0, name, sizeof name, &length, &error), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_record_name(2, nullptr, 3, name, sizeof name, &length, &error), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_record_name(2, hash, 65, name, sizeof name, &length, &error), PINWELL_ERROR_ARGUMENT);
}

TEST_F(CInterface, FitsTheLongestNameIntoABufferOfTheSizeThatItStates) {
    const unsigned char hash[64] = {};
    char name[PINWELL_RECORD_NAME_SIZE];
    EXPECT_EQ(pinwell_record_name(UINT32_MAX, hash, sizeof hash, name, sizeof name, nullptr, &error),
              PINWELL_OK);
}

TEST_F(CInterface, SaysHowLargeABufferANameNeeds) {
    const unsigned char hash[] = {0x12};
    char name[] = "untouched";
    std::size_t length = 0;
    for (const std::size_t size : {0U, 1U, 6U}) {
        EXPECT_EQ(pinwell_record_name(2, hash, 1, name, size, &length, &error), PINWELL_ERROR_BUFFER);
        EXPECT_EQ(length, 6U);
        EXPECT_STREQ(name, "untouched");
    }
    EXPECT_EQ(pinwell_record_name(2, hash, 1, nullptr, 0, &length, &error), PINWELL_ERROR_BUFFER);
    EXPECT_EQ(pinwell_record_name(2, hash, 1, nullptr, 7, &length, &error), PINWELL_ERROR_ARGUMENT);
    EXPECT_EQ(pinwell_record_name(2, hash, 1, name, 7, &length, &error), PINWELL_OK);
    EXPECT_STREQ(name, "2/2/12");
}

}  // namespace
}  // namespace pinwell::test
