// Receivers of a response's body: memory, or the temporary file of a download.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "base/bytes.h"
#include "base/handle.h"
#include "https/session.h"

namespace pinwell::https {

class BodySink {
  public:
    virtual ~BodySink() = default;

    /// The next piece. An error ends the transfer.
    virtual Result<void> write(base::ByteView bytes) = 0;
};

/// Keeps the body in memory.
class MemorySink : public BodySink {
  public:
    Result<void> write(base::ByteView bytes) override {
        base::append(data_, bytes);
        return {};
    }
    Data take() { return std::move(data_); }

  private:
    Data data_;
};

/// A new file of mode 0600 that nobody else could have created. It is removed with this object. It is also
/// removed if exit() ends the process while the object lives: the callback for a finished download may do
/// that.
class DownloadFile : public BodySink {
  public:
    static Result<std::unique_ptr<DownloadFile>> make(const URL& directory);
    ~DownloadFile() override;
    DownloadFile(const DownloadFile&) = delete;
    DownloadFile& operator=(const DownloadFile&) = delete;

    Result<void> write(base::ByteView bytes) override;

    /// Closes it; some file systems report a failed write only then.
    Result<void> finish();

    URL location() const { return URL::fileURLWithPath(path_); }

  private:
    DownloadFile(base::FileDescriptor file, std::string path);
    Error failure(int number) const;

    base::FileDescriptor file_;
    std::string path_;
};

}  // namespace pinwell::https
