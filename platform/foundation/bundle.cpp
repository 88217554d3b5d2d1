#include "foundation/bundle.h"

#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <system_error>

#include "foundation/file_io.h"
#include "foundation/property_list.h"
#include "foundation/url.h"

namespace pinwell::foundation {
namespace {

constexpr std::string_view kExecutableKey = "CFBundleExecutable";

bool isDirectory(const std::string& path) {
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// Of the thing itself: what a link in the bundle leads to is not part of it.
bool isOwnEntry(const std::string& path, mode_t format) {
    struct stat status {};
    return ::lstat(path.c_str(), &status) == 0 && (status.st_mode & S_IFMT) == format;
}

bool isPlainName(std::string_view name) {
    return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
           name.find('\0') == std::string_view::npos;
}

// The first of `candidates` that is there; an unreadable one hides those behind it.
Value informationDictionary(std::initializer_list<std::string> candidates) {
    for (const std::string& path : candidates) {
        Result<Data> document = readSmallFile(path, kMaximumPropertyListSize);
        if (!document && (document.error().code() == ENOENT || document.error().code() == ENOTDIR)) continue;
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

std::optional<std::string> executableIn(const std::string& directory, const std::string& name) {
    if (!isPlainName(name)) return std::nullopt;
    const std::string path = directory + "/" + name;
    if (!isOwnEntry(path, S_IFREG)) return std::nullopt;
    return path;
}

bool hasExecuteBit(const std::string& path) {
    struct stat status {};
    return ::lstat(path.c_str(), &status) == 0 && (status.st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)) != 0;
}

// Files of one class, of which one alone can be the executable. Keeps the first path and the number of all.
struct Candidates {
    std::string first;
    std::size_t count = 0;

    void add(std::string path) {
        if (count++ == 0) first = std::move(path);
    }
};

// A directory that cannot be read to its end might hold a second candidate.
std::optional<std::string> executableBelow(const std::string& contents, const std::string& name) {
    Candidates executable;
    Candidates other;
    std::error_code failure;
    std::filesystem::directory_iterator entry(contents, failure);
    for (; !failure && entry != std::filesystem::directory_iterator(); entry.increment(failure)) {
        if (!isOwnEntry(entry->path().native(), S_IFDIR)) continue;
        auto found = executableIn(entry->path().native(), name);
        if (!found) continue;
        (hasExecuteBit(*found) ? executable : other).add(*std::move(found));
    }
    const Candidates& counted = executable.count > 0 ? executable : other;
    if (failure || counted.count != 1) return std::nullopt;
    return counted.first;
}

}  // namespace

std::optional<std::string> mainExecutableOfBundle(const std::string& path) {
    if (!isDirectory(path)) return std::nullopt;
    const std::string version = path + "/Versions/Current";
    if (isDirectory(version)) {
        const Value information = informationDictionary({version + "/Resources/Info.plist"});
        return executableIn(version, executableName(information, path));
    }
    const std::string contents = path + "/Contents";
    const Value information = informationDictionary(
        {contents + "/Info.plist", path + "/Resources/Info.plist", path + "/Info.plist"});
    const std::string name = executableName(information, path);
    return isDirectory(contents) ? executableBelow(contents, name) : executableIn(path, name);
}

}  // namespace pinwell::foundation
