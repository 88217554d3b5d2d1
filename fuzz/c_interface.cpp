// The C interface, as a program calls it with a received file: every function, on an artefact with the input
// as one of its files, and on freed handles.
//
// The first byte of the input selects the file; the rest is its contents. Some values of this byte mean that
// the rest is certificates, or a hash.
#include <pinwell/ticket_c.h>
#include <sys/stat.h>

#include <array>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "support/temporary_directory.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

/// A file that the input replaces, and its artefact.
struct Place {
    const char* artefact;
    const char* file;
};
constexpr std::array<Place, 7> kPlaces{{{"image.dmg", "image.dmg"},
                                        {"package.pkg", "package.pkg"},
                                        {"executable", "executable"},
                                        {"Sample.app", "Sample.app/Contents/CodeResources"},
                                        {"Sample.app", "Sample.app/Contents/_CodeSignature/CodeResources"},
                                        {"Sample.app", "Sample.app/Contents/Info.plist"},
                                        {"Sample.app", "Sample.app/Contents/Programs/Sample"}}};

const test::TemporaryDirectory& folder() {
    static const test::TemporaryDirectory directory;
    static const bool isFilled = [] {
        std::filesystem::copy(
            VECTORS_DIRECTORY "/artefacts/Sample.app", directory / "Sample.app",
            std::filesystem::copy_options::recursive | std::filesystem::copy_options::copy_symlinks);
        return true;
    }();
    static_cast<void>(isFilled);
    return directory;
}

pinwell_roots* roots() {
    static pinwell_roots* const handle = [] {
        pinwell_roots* made = nullptr;
        const std::string path = VECTORS_DIRECTORY "/platform";
        require(pinwell_roots_from_directory(path.c_str(), path.size(), &made, nullptr) == PINWELL_OK,
                "roots are read");
        return made;
    }();
    return handle;
}

bool isText(const char* text, std::size_t length) {
    return text != nullptr && text[length] == '\0';
}

void examineChecks(const pinwell_result* result) {
    const std::size_t count = pinwell_result_check_count(result);
    require(count > 0, "something is asked of every path");
    for (std::size_t i = 0; i < count; ++i) {
        pinwell_check check = PINWELL_CHECK_INIT;
        require(pinwell_result_check(result, i, &check) == PINWELL_OK, "there is a check at every index");
        require(check.outcome >= PINWELL_OUTCOME_PASSED && check.outcome <= PINWELL_OUTCOME_FAILED,
                "an outcome is one of those that there are");
        require(isText(check.name, check.name_length) && check.name_length > 0, "a check has a name");
        require(isText(check.place, check.place_length) && isText(check.expected, check.expected_length) &&
                    isText(check.found, check.found_length),
                "texts end in a zero byte");
    }
    pinwell_check check = PINWELL_CHECK_INIT;
    require(pinwell_result_check(result, count, &check) == PINWELL_ERROR_RANGE,
            "there is none behind the last");
}

using Assess = decltype(pinwell_judge_file);

pinwell_verdict examineResult(Assess* assess, const std::string& path) {
    pinwell_options options = PINWELL_OPTIONS_INIT;
    options.threads = 1;
    pinwell_error error = PINWELL_ERROR_INIT;
    pinwell_result* result = nullptr;
    require(assess(path.c_str(), path.size(), roots(), &options, &result, &error) == PINWELL_OK,
            "whatever is wrong with an artefact is a verdict");
    const pinwell_verdict verdict = pinwell_result_verdict(result);
    require(verdict >= PINWELL_VERDICT_GOOD && verdict <= PINWELL_VERDICT_REVOKED,
            "a verdict is one of those that there are");
    require((verdict == PINWELL_VERDICT_GOOD) == (pinwell_result_exit_status(result) == 0),
            "0 is for what is good alone");
    std::size_t length = 0;
    const char* const reason = pinwell_result_reason(result, &length);
    require(isText(reason, length) && length > 0, "a verdict has a reason");
    examineChecks(result);

    const char* const recordName = pinwell_result_record_name(result, &length);
    require(isText(recordName, length), "texts end in a zero byte");
    const bool hasName = length > 0;
    const bool hasHash = pinwell_result_code_hash(result, &length) != nullptr;
    require(hasName == hasHash && (!hasHash || length == 20 || length == 48), "a record is named by a hash");
    std::array<char, PINWELL_RECORD_NAME_SIZE> name{};
    const pinwell_status named =
        pinwell_record_name_of_file(path.c_str(), path.size(), name.data(), name.size(), nullptr, &error);
    require((named == PINWELL_OK) == hasName, "a record's name is the same wherever it is asked for");

    require(pinwell_result_free(result) == PINWELL_OK, "a result can be freed");
    require(pinwell_result_free(result) == PINWELL_ERROR_HANDLE, "a result is freed once");
    require(pinwell_result_verdict(result) == PINWELL_VERDICT_NONE, "there is no verdict behind its end");
    return verdict;
}

void examineTicket(const std::string& path, const Place& place, const std::string& contents) {
    pinwell_ticket* ticket = nullptr;
    pinwell_error error = PINWELL_ERROR_INIT;
    const pinwell_status status = pinwell_find_ticket(path.c_str(), path.size(), &ticket, &error);
    require((status == PINWELL_OK) == (ticket != nullptr), "there is a handle if there is a ticket");
    require(status == PINWELL_OK || std::strlen(error.message) > 0, "a failure has a message");
    if (ticket == nullptr) return;
    std::size_t length = 0;
    const unsigned char* const bytes = pinwell_ticket_bytes(ticket, &length);
    const std::uint64_t offset = pinwell_ticket_offset(ticket);
    std::size_t fileLength = 0;
    const std::string file = pinwell_ticket_file(ticket, &fileLength);
    if (file == folder() / place.file) {
        require(offset <= contents.size() && length <= contents.size() - offset && length > 0,
                "a ticket is within its file");
        require(std::memcmp(bytes, contents.data() + offset, length) == 0,
                "a ticket is where it is said to be");
    }
    require(pinwell_ticket_free(ticket) == PINWELL_OK, "a ticket can be freed");
}

void examineRoots(ByteView input) {
    pinwell_roots* made = nullptr;
    const pinwell_status status = pinwell_roots_from_certificates(input.data(), input.size(), &made, nullptr);
    require(status == PINWELL_OK || status == PINWELL_ERROR_NO_CERTIFICATES,
            "bytes are certificates, or none");
    require((status == PINWELL_OK) == (pinwell_roots_count(made) > 0), "roots are some");
    pinwell_roots_free(made);
}

/// The input is a digest type, the size of a buffer, and a hash.
void examineRecordName(ByteView input) {
    constexpr std::size_t kFields = 2;
    if (input.size() < kFields) return;
    const auto digestType = std::to_integer<std::uint32_t>(input[0]);
    const auto bufferSize = std::to_integer<std::size_t>(input[1]);
    const ByteView hash = input.subspan(kFields);
    std::vector<char> buffer(bufferSize, '?');
    std::size_t length = 0;
    const pinwell_status status = pinwell_record_name(digestType, hash.data(), hash.size(), buffer.data(),
                                                      buffer.size(), &length, nullptr);
    const bool isHash = !hash.empty() && hash.size() <= 64;
    require((status == PINWELL_ERROR_ARGUMENT) == !isHash, "a hash has 1 to 64 bytes");
    if (!isHash) return;
    require(length < PINWELL_RECORD_NAME_SIZE, "every name has room in the size that is said to do");
    require((status == PINWELL_OK) == (length < bufferSize), "a name is written if there is room");
    if (status == PINWELL_OK)
        require(std::strlen(buffer.data()) == length && length > 2 * hash.size(),
                "a name has all of the hash");
}

/// Replaces a file by the input, and restores its contents.
class Replaced {
  public:
    Replaced(std::string path, const std::string& contents) : path_(std::move(path)) {
        isThere_ = std::filesystem::exists(path_);
        if (isThere_) before_ = test::readFile(path_);
        test::writeFile(path_, std::string_view(contents));
        chmod(path_.c_str(), 0755);
    }
    ~Replaced() {
        if (isThere_)
            test::writeFile(path_, std::string_view(before_));
        else
            std::filesystem::remove(path_);
    }
    Replaced(const Replaced&) = delete;
    Replaced& operator=(const Replaced&) = delete;

  private:
    std::string path_;
    std::string before_;
    bool isThere_ = false;
};

}  // namespace

void examine(ByteView input) {
    if (input.empty()) return;
    const auto selector = std::to_integer<std::size_t>(input.front());
    const ByteView rest = input.subspan(1);
    const std::size_t choice = selector % (kPlaces.size() + 2);
    if (choice == kPlaces.size()) return examineRoots(rest);
    if (choice > kPlaces.size()) return examineRecordName(rest);
    const Place& place = kPlaces[choice];
    const std::string contents = base::toString(rest);
    const Replaced replaced(folder() / place.file, contents);
    const std::string path = folder() / place.artefact;
    const pinwell_verdict judged = examineResult(pinwell_judge_file, path);
    const pinwell_verdict verified = examineResult(pinwell_verify_file, path);
    require(verified != PINWELL_VERDICT_GOOD || judged == PINWELL_VERDICT_GOOD,
            "what is good down to every byte has a good ticket");
    examineTicket(path, place, contents);
}

}  // namespace pinwell::fuzz
