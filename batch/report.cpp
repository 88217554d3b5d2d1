#include "report.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <utility>

#include "base/file_io.h"
#include "base/handle.h"
#include "base/text.h"
#include "companion/streams.h"
#include "src/DownloadDelegate.h"
#include "values/format.h"

namespace pinwell::batch {

using base::Error;
using base::Result;
using retrieval::Cause;
using Json = nlohmann::ordered_json;

void Summary::count(const Report& report) {
    ++total;
    ++byCause.at(static_cast<std::size_t>(report.cause));
    exitStatus = retrieval::worseStatus(exitStatus, report.exitStatus);
}

bool Summary::holdsVerdictsOnly() const {
    const auto causes = retrieval::allCauses();
    return std::all_of(causes.begin(), causes.end(),
                       [this](Cause cause) { return isVerdict(cause) || numberOf(cause) == 0; });
}

std::string_view nameOfOperation(std::uint8_t operation) noexcept {
    return operation == kOperationStaple ? "staple" : "validate";
}

std::string asJson(const Summary& summary) {
    Json causes = Json::object();
    for (const Cause cause : retrieval::allCauses())
        if (const auto number = summary.numberOf(cause); number > 0)
            causes[std::string(nameOf(cause))] = number;
    const auto worked = summary.numberOf(Cause::worked);
    const Json json = {{"summary",
                        {{"version", 1},
                         {"operation", summary.operation},
                         {"total", summary.total},
                         {"worked", worked},
                         {"failed", summary.total - worked},
                         {"resumed", summary.resumed},
                         {"duplicates", summary.duplicates},
                         {"causes", causes},
                         {"exitStatus", summary.exitStatus},
                         {"seconds", summary.seconds}}}};
    return json.dump();
}

std::string asText(const Summary& summary) {
    std::string text = std::to_string(summary.total) + (summary.total == 1 ? " artefact" : " artefacts");
    const char* separator = ": ";
    for (const Cause cause : retrieval::allCauses()) {
        const std::uint64_t number = summary.numberOf(cause);
        if (number == 0) continue;
        text += separator + std::to_string(number) + " " + std::string(nameOf(cause));
        separator = ", ";
    }
    if (summary.resumed > 0) text += values::format("; %llu done before", summary.resumed);
    if (summary.duplicates > 0) text += values::format("; %llu named twice", summary.duplicates);
    const auto tenths = static_cast<std::uint64_t>(std::llround(summary.seconds * 10));
    return text + values::format("; %llu.%llu s", tenths / 10, tenths % 10);
}

namespace {

constexpr std::size_t kReportPieceSize = std::size_t{64} * 1024;
// Space for the counts, which are known at the end: blanks between attributes have no meaning.
constexpr std::size_t kCountsWidth = 160;

std::string secondsText(double seconds) {
    const auto milliseconds = static_cast<std::uint64_t>(std::llround(seconds * 1000));
    std::string fraction = std::to_string(milliseconds % 1000);
    return std::to_string(milliseconds / 1000) + "." + std::string(3 - fraction.size(), '0') + fraction;
}

std::string prologue(std::string_view counts) {
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuites>\n<testsuite ";
    text += counts;
    text += std::string(kCountsWidth - std::min(counts.size(), kCountsWidth), ' ');
    return text + ">\n";
}

Error refusal(std::string text) {
    return {base::kDataErrorDomain, base::kMalformedDocument, std::move(text)};
}

bool beginsAsXml(const std::string& path) {
    constexpr std::string_view kBeginning = "<?xml";
    const auto file = base::openRegularFile(path, O_RDONLY);
    std::array<char, kBeginning.size()> bytes{};
    return file &&
           ::read(file->descriptor.get(), bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()) &&
           std::string_view(bytes.data(), bytes.size()) == kBeginning;
}

// If the option's argument is missing, the option takes the first artefact instead. A report must not
// overwrite it. Only a file may be replaced: a device would become a file. A link stays a link.
Result<std::string> placeOfReport(const std::string& path) {
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) {
        const bool isLink = ::lstat(path.c_str(), &status) == 0;
        return isLink ? Result<std::string>(Error::posix(ENOENT, path)) : path;
    }
    if (!S_ISREG(status.st_mode)) return refusal(path + " is not a regular file.");
    if (status.st_size > 0 && !beginsAsXml(path))
        return refusal(path + " is there already, and is no report.");
    std::error_code failure;
    const std::string place = std::filesystem::canonical(path, failure);
    if (failure) return Error::posix(failure.value(), path);
    return place;
}

}  // namespace

Result<JUnitReport> JUnitReport::begin(const std::string& name) {
    const auto place = placeOfReport(name);
    if (!place) return place.error();
    auto made = companion::makeFileBeside(*place);
    if (!made) return made.error();
    JUnitReport report(*place, std::move(made->path), std::move(made->file));
    report.write(prologue(""));
    return report;
}

JUnitReport::JUnitReport(JUnitReport&& other) noexcept
    : path_(std::move(other.path_)),
      temporary_(std::exchange(other.temporary_, {})),
      file_(std::move(other.file_)),
      pending_(std::move(other.pending_)),
      failure_(other.failure_) {}

JUnitReport::~JUnitReport() {
    if (!temporary_.empty()) ::unlink(temporary_.c_str());
}

void JUnitReport::add(const Report& report) {
    std::string text = "<testcase classname=\"pinwell." + std::string(report.operation) + "\" name=\"" +
                       base::markupText(report.path) + "\" time=\"" + secondsText(report.seconds) + "\"";
    if (report.cause == Cause::worked) {
        write(text + "/>\n");
        return;
    }
    // A verdict on the artefact is a failure; anything that prevented a verdict is an error.
    const char* const element = isVerdict(report.cause) ? "failure" : "error";
    text += std::string(">\n<") + element + " type=\"" + std::string(nameOf(report.cause)) + "\" message=\"" +
            std::string(nameOf(report.cause)) + ": exit status " + std::to_string(report.exitStatus) + "\">";
    for (const std::string& message : report.messages) text += base::markupText(message) + "\n";
    write(text + "</" + element + ">\n</testcase>\n");
}

Result<void> JUnitReport::finish(const Summary& summary) {
    std::uint64_t errors = 0;
    for (const Cause cause : retrieval::allCauses())
        if (!isVerdict(cause)) errors += summary.numberOf(cause);
    const std::uint64_t failures = summary.total - summary.numberOf(Cause::worked) - errors;
    write("</testsuite>\n</testsuites>\n");
    flush();
    const std::string head = prologue(values::format(
        "name=\"pinwell-batch %@\" tests=\"%llu\" failures=\"%llu\" "
        "errors=\"%llu\" skipped=\"0\" time=\"%@\"",
        std::string(summary.operation), summary.total, failures, errors, secondsText(summary.seconds)));
    if (failure_ == 0 &&
        ::pwrite(file_.get(), head.data(), head.size(), 0) != static_cast<ssize_t>(head.size()))
        failure_ = errno;
    if (failure_ == 0 && ::fsync(file_.get()) != 0 && errno != EINVAL) failure_ = errno;
    if (failure_ == 0 && std::rename(temporary_.c_str(), path_.c_str()) != 0) failure_ = errno;
    if (failure_ != 0) return Error::posix(failure_, path_);
    temporary_.clear();
    return {};
}

void JUnitReport::write(const std::string& text) {
    pending_ += text;
    if (pending_.size() >= kReportPieceSize) flush();
}

void JUnitReport::flush() {
    for (std::string_view rest = pending_; !rest.empty() && failure_ == 0;) {
        const ssize_t count = ::write(file_.get(), rest.data(), rest.size());
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) failure_ = errno;
        if (count > 0) rest.remove_prefix(static_cast<std::size_t>(count));
    }
    pending_.clear();
}

}  // namespace pinwell::batch
