// Bundles whose code hash is the text in their executable: many artefacts with different hashes, without a
// signature. For any thread.
#pragma once

#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "base/bytes.h"
#include "support/fake_code_signing.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

inline constexpr std::size_t kBundleHashLength = 20;

/// Returns when a new file would get another time than this file: the clock of a file system may have steps
/// of some milliseconds.
inline void waitForAnotherTimeThan(const std::string& file) {
    const std::string clock = file + ".clock";
    struct stat of {};
    struct stat now {};
    if (::lstat(file.c_str(), &of) != 0) return;
    do {
        writeFile(clock, std::string_view("tick"));
        if (::lstat(clock.c_str(), &now) != 0) throw std::runtime_error(clock);
    } while (now.st_ctim.tv_sec == of.st_ctim.tv_sec && now.st_ctim.tv_nsec == of.st_ctim.tv_nsec);
    ::unlink(clock.c_str());
}

/// Writes the bundle, with another time than an existing one. The hash is `text`, filled up with dots.
inline void writeBundle(const std::string& path, const std::string& text) {
    std::string hash = text;
    hash.resize(kBundleHashLength, '.');
    waitForAnotherTimeThan(path + "/Contents/MacOS/App");
    writeFile(path + "/Contents/MacOS/App", hash);
    writeFile(
        path + "/Contents/Info.plist",
        std::string_view("<plist><dict><key>CFBundleExecutable</key><string>App</string></dict></plist>"));
}

class HashByExecutable : public FakeCodeSigningService {
  public:
    /// The text of an executable that makes a query for its hash raise an exception.
    static constexpr const char* kRaises = "raises..............";

    base::Result<std::shared_ptr<codesign::StaticCode>> staticCode(const values::URL& url,
                                                                   std::uint32_t) const override {
        auto code = std::make_shared<Code>();
        code->path = url.path();
        return std::shared_ptr<codesign::StaticCode>(std::move(code));
    }
    base::Result<void> checkValidity(const codesign::StaticCode&, std::uint32_t) const override { return {}; }
    base::Result<std::optional<codesign::SigningInformation>> signingInformation(
        const codesign::StaticCode& code, std::uint32_t) const override {
        const std::string hash = readFile(dynamic_cast<const Code&>(code).path + "/Contents/MacOS/App");
        if (hash == kRaises) throw std::runtime_error("nobody has thought of this");
        codesign::SigningInformation found;
        found.unique = base::toData(hash);
        found.digestAlgorithm = 2;
        return std::optional(std::move(found));
    }

  private:
    struct Code : codesign::StaticCode {
        std::string path;
    };
};

}  // namespace pinwell::test
