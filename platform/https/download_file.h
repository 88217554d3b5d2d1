// The temporary file of a download.
#pragma once

#include <memory>

#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "https/body_sink.h"

namespace pinwell::https {

/// A new file of mode 0600 that nobody else could have created. It is removed with this object. It is also
/// removed if exit() ends the process while the object lives: the callback for a finished download may do
/// that.
class DownloadFile : public BodySink {
  public:
    static foundation::Result<std::unique_ptr<DownloadFile>> create(const URL& directory);
    ~DownloadFile() override;
    DownloadFile(const DownloadFile&) = delete;
    DownloadFile& operator=(const DownloadFile&) = delete;

    std::optional<Error> write(foundation::ByteView bytes) override;

    /// Closes it; some file systems report a failed write only then.
    std::optional<Error> finish();

    URL location() const { return URL::fileURLWithPath(path_); }

  private:
    DownloadFile(foundation::FileDescriptor file, std::string path);
    Error failure(int number) const;

    foundation::FileDescriptor file_;
    std::string path_;
};

}  // namespace pinwell::https
