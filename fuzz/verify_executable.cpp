// Deep verification of an executable image: headers, slices, every code directory, every page.
#include "verified_bytes.h"

namespace pinwell::fuzz {

void examine(ByteView input) {
    examineVerified(
        input,
        [](const base::ByteSource& source, verify::Workers& workers, verify::Section& section) {
            return verify::verifyExecutable(source, {}, "executable", workers, section);
        },
        Coverage::whole);
}

}  // namespace pinwell::fuzz
