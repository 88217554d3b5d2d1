#include "values/bundle.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <initializer_list>
#include <memory>
#include <string_view>

#include "base/bytes.h"
#include "base/file_io.h"
#include "values/property_list.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell::values {
namespace {

using base::Data;
using base::Error;
using base::HeldPlace;
using base::Places;
using base::Result;

constexpr std::string_view kExecutableKey = "CFBundleExecutable";
constexpr std::string_view kContents = "Contents";
constexpr std::string_view kCurrentVersion = "Versions/Current";

bool isDirectory(const HeldPlace& bundle, const std::string& relative) {
    return bundle.open(relative, O_PATH | O_DIRECTORY).has_value();
}

// Status of the entry itself: the target of a link is not part of the bundle.
std::optional<struct stat> statusOfEntry(int directory, const char* name, mode_t format) {
    struct stat status {};
    if (fstatat(directory, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return std::nullopt;
    return (status.st_mode & S_IFMT) == format ? std::optional(status) : std::nullopt;
}

bool isPlainName(std::string_view name) {
    return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
           name.find('\0') == std::string_view::npos;
}

// A path through a link that leads out (EXDEV) counts as missing too.
bool isAbsent(const Error& error) {
    return error.code() == ENOENT || error.code() == ENOTDIR || error.code() == EXDEV;
}

Result<Data> readListAt(const HeldPlace& bundle, const std::string& relative) {
    // Checked before it is opened for reading: opening alone can have an effect on a device.
    const auto looked = bundle.open(relative, O_PATH);
    if (!looked) return looked.error();
    struct stat status {};
    if (fstat(looked->get(), &status) != 0 || !S_ISREG(status.st_mode)) return Error::posix(EINVAL, relative);
    const auto file = bundle.open(relative, O_RDONLY | O_NONBLOCK | O_NOCTTY);
    if (!file) return file.error();
    return base::readSmallFile(*file, relative, kMaximumPropertyListSize);
}

// The first of `candidates` that exists; an unreadable one hides the ones after it.
Value informationDictionary(const HeldPlace& bundle, std::initializer_list<std::string> candidates) {
    for (const std::string& relative : candidates) {
        const Result<Data> document = readListAt(bundle, relative);
        if (!document && isAbsent(document.error())) continue;
        if (!document) return {};
        Result<Value> list = parsePropertyList(*document);
        return list && list->dictionary() != nullptr ? *list : Value();
    }
    return {};
}

std::string executableName(const Value& information, const std::string& bundlePath) {
    const std::string* named = information[kExecutableKey].string();
    if (named != nullptr && isPlainName(*named)) return *named;
    const URL url = URL::fileURLWithPath(bundlePath);
    std::string name = url.lastPathComponent();
    if (const std::string extension = url.pathExtension(); !extension.empty())
        name.resize(name.size() - extension.size() - 1);
    return name;
}

std::optional<std::string> executableIn(const HeldPlace& bundle, const std::string& relative,
                                        const std::string& name) {
    if (!isPlainName(name)) return std::nullopt;
    const auto directory = bundle.open(relative, O_PATH | O_DIRECTORY);
    if (!directory || !statusOfEntry(directory->get(), name.c_str(), S_IFREG)) return std::nullopt;
    return relative.empty() ? name : relative + "/" + name;
}

// Files of one class, of which a single one can be the executable. Keeps the first path and the number of
// all.
struct Candidates {
    std::string first;
    std::size_t count = 0;

    void add(std::string path) {
        if (count++ == 0) first = std::move(path);
    }
};

struct DirectoryCloser {
    void operator()(DIR* directory) const noexcept { closedir(directory); }
};
using DirectoryStream = std::unique_ptr<DIR, DirectoryCloser>;

// Adds the file `name` of the sub-directory to its class of candidates.
void addCandidate(int contents, const std::string& directory, const std::string& name, Candidates& executable,
                  Candidates& other) {
    if (!isPlainName(directory) || !statusOfEntry(contents, directory.c_str(), S_IFDIR)) return;
    const base::FileDescriptor opened(
        openat(contents, directory.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!opened) return;
    const auto file = statusOfEntry(opened.get(), name.c_str(), S_IFREG);
    if (!file) return;
    const bool mayExecute = (file->st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)) != 0;
    (mayExecute ? executable : other).add(directory + "/" + name);
}

// A directory that cannot be read completely might have a second candidate.
std::optional<std::string> executableBelow(const HeldPlace& bundle, const std::string& name) {
    if (!isPlainName(name)) return std::nullopt;
    auto contents = bundle.open(std::string(kContents), O_RDONLY | O_DIRECTORY);
    if (!contents) return std::nullopt;
    const DirectoryStream stream(fdopendir(contents->get()));
    if (!stream) return std::nullopt;
    const int directory = contents->release();  // the stream owns it now

    Candidates executable;
    Candidates other;
    errno = 0;
    while (const dirent* const entry = readdir(stream.get())) {
        addCandidate(directory, &entry->d_name[0], name, executable, other);
        errno = 0;
    }
    const Candidates& counted = executable.count > 0 ? executable : other;
    if (errno != 0 || counted.count != 1) return std::nullopt;
    return std::string(kContents) + "/" + counted.first;
}

std::optional<std::string> mainExecutableBelow(const HeldPlace& bundle, const std::string& path) {
    if (isDirectory(bundle, std::string(kCurrentVersion))) {
        const std::string version(kCurrentVersion);
        const Value information = informationDictionary(bundle, {version + "/Resources/Info.plist"});
        return executableIn(bundle, version, executableName(information, path));
    }
    const Value information =
        informationDictionary(bundle, {"Contents/Info.plist", "Resources/Info.plist", "Info.plist"});
    const std::string name = executableName(information, path);
    return isDirectory(bundle, std::string(kContents)) ? executableBelow(bundle, name)
                                                       : executableIn(bundle, "", name);
}

}  // namespace

std::optional<std::string> mainExecutableOfBundle(Places& places, const std::string& path) {
    const auto bundle = places.hold(path);
    if (!bundle || !(*bundle)->isTree()) return std::nullopt;
    const auto found = mainExecutableBelow(**bundle, path);
    return found ? std::optional(path + "/" + *found) : std::nullopt;
}

std::optional<std::string> mainExecutableOfBundle(const std::string& path) {
    Places places;
    return mainExecutableOfBundle(places, path);
}

}  // namespace pinwell::values
