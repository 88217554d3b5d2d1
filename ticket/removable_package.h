// A flat package whose ticket is to go.
#pragma once

#include "src/PWHashedFile/PWHashedFlatPackage.h"

namespace pinwell::ticket_files {

/// Goes with its ticket: the terminator as well, if it marks the beginning of nothing else. The package is
/// then as it was before its first staple, and can be stapled again. A terminator that was left alone would
/// have the next ticket written over the package from its first byte on.
///
/// Trailers of other types stay, and the terminator with them.
class RemovablePackage : public PWHashedFlatPackage {
  public:
    using PWHashedFlatPackage::PWHashedFlatPackage;

    bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target, bool deleteExisting,
                                    ErrorOut error) override;

  private:
    bool cutTerminatorToo(files::FileHandle& file) const;
};

}  // namespace pinwell::ticket_files
