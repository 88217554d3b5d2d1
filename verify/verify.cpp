#include "verify/verify.h"

#include "codesign/code_error.h"
#include "foundation/byte_reader.h"
#include "foundation/places.h"
#include "verify/bundle.h"
#include "verify/check_names.h"
#include "verify/disk_image.h"
#include "verify/package.h"

namespace pinwell::verify {

namespace {

VerifiedCode verified(const Subject& subject, Workers& workers, Section& root) {
    switch (subject.kind) {
        case Kind::bundle:
            return verifyBundle(subject.path, workers, root);
        case Kind::executable:
            return verifyExecutable(codesign::FileSource(foundation::Places(), subject.path), {},
                                    "executable", workers, root);
        case Kind::diskImage:
            return verifyDiskImage(codesign::FileSource(foundation::Places(), subject.path), workers, root);
        case Kind::package:
            break;
    }
    return verifyPackage(codesign::FileSource(foundation::Places(), subject.path), workers, root);
}

}  // namespace

Report verifyArtefact(const Subject& subject, Workers& workers) {
    Report report;
    try {
        report.code = verified(subject, workers, report.root);
    } catch (const codesign::CodeError& error) {
        if (error.status() == codesign::kInvalidSignature) {
            report.code.isSigned = true;
            report.root.fail(kSignature, {}, "a well-formed signature", error.what());
        } else {
            report.root.cannotRead(kArtefact, {}, error.what());
        }
    } catch (const foundation::ShortRead& error) {
        report.code.isSigned = true;
        report.root.fail(kSignature, {}, "a well-formed signature", error.what());
    }
    return report;
}

}  // namespace pinwell::verify
