#include "trust/anchors.h"

#include <algorithm>
#include <string>

#include "base/bytes.h"
#include "base/file_io.h"
#include "base/text.h"
#include "trust/der.h"
#include "values/format.h"

namespace pinwell::trust {

namespace {

constexpr std::string_view kBegin = "-----BEGIN ";
constexpr std::string_view kEnd = "-----END ";
constexpr std::string_view kDashes = "-----";

struct Marker {
    bool begins = false;
    std::string_view label;
    std::size_t position = 0;
    std::size_t end = 0;
};

/// The next marker at or after `from`; `nullopt` if there is none. A marker is in one line.
std::optional<Marker> findMarker(std::string_view text, std::size_t from) {
    while ((from = text.find(kDashes, from)) != std::string_view::npos) {
        const std::string_view rest = text.substr(from);
        const bool begins = rest.starts_with(kBegin);
        if (!begins && !rest.starts_with(kEnd)) {
            ++from;
            continue;
        }
        const std::size_t label = from + (begins ? kBegin : kEnd).size();
        const std::size_t end = text.find_first_of("-\r\n", label);
        if (end == std::string_view::npos || !text.substr(end).starts_with(kDashes)) {
            from = label;
            continue;
        }
        return Marker{begins, text.substr(label, end - label), from, end + kDashes.size()};
    }
    return std::nullopt;
}

class BlockReader {
  public:
    explicit BlockReader(std::string_view text) : text_(text) {}

    std::vector<PemBlock> read() && {
        std::optional<Marker> marker = findMarker(text_, 0);
        while (marker) {
            std::optional<Marker> next = findMarker(text_, marker->end);
            if (!marker->begins) {
                add(*marker).damage = "it has an end and no beginning";
            } else if (!next || next->begins || next->label != marker->label) {
                add(*marker).damage = "its end is missing";
            } else {
                readBody(add(*marker), text_.substr(marker->end, next->position - marker->end));
                next = findMarker(text_, next->end);
            }
            marker = next;
        }
        return std::move(blocks_);
    }

  private:
    PemBlock& add(const Marker& marker) {
        line_ += static_cast<std::size_t>(
            std::count(text_.begin() + static_cast<std::ptrdiff_t>(counted_),
                       text_.begin() + static_cast<std::ptrdiff_t>(marker.position), '\n'));
        counted_ = marker.position;
        blocks_.push_back({marker.label, line_, std::nullopt, {}});
        return blocks_.back();
    }

    static void readBody(PemBlock& block, std::string_view body) {
        std::string base64;
        std::copy_if(body.begin(), body.end(), std::back_inserter(base64),
                     [](char c) { return !base::isSpace(c); });
        block.data = base::decodeBase64(base64);
        if (!block.data) block.damage = "it is not in base64";
    }

    std::string_view text_;
    std::size_t counted_ = 0;  // lines are counted up to here
    std::size_t line_ = 1;
    std::vector<PemBlock> blocks_;
};

}  // namespace

std::vector<PemBlock> readPemBlocks(std::string_view text) {
    return BlockReader(text).read();
}

bool isCertificateBlock(const PemBlock& block) {
    return block.label == "CERTIFICATE" || block.label == "X509 CERTIFICATE" ||
           block.label == "X.509 CERTIFICATE";
}

namespace {

struct DeniedParts {
    ByteView signedPart;
    Data key;
};

/// Skips every check that is not needed to find the key.
std::optional<DeniedParts> findParts(ByteView der) {
    using der::Cursor;
    try {
        Cursor whole = Cursor(der).enter(der::kConstructedSequence);
        const der::Element signedPart = whole.take(der::kConstructedSequence);
        Cursor body(signedPart.contents);
        body.takeIf(der::contextTag(0, true));
        body.any();                                                        // serial number
        for (int i = 0; i < 4; ++i) body.take(der::kConstructedSequence);  // up to the subject
        const std::optional<Data> key = readKeyIdentity(body.take(der::kConstructedSequence).contents);
        if (!key) return std::nullopt;
        return DeniedParts{signedPart.whole, *key};
    } catch (const der::Malformed&) {
        return std::nullopt;
    }
}

}  // namespace

DenyList::DenyList(const CertificateList& certificates) {
    for (const X509CertificateRef& certificate : certificates) add(certificate);
}

void DenyList::add(const X509CertificateRef& certificate) {
    certificates_.push_back(certificate);
    signedParts_.insert(std::string(base::asText(certificate->parts().signedPart)));
    keys_.insert(base::toString(certificate->subjectKey().identity));
    ++size_;
}

bool DenyList::addUnreadable(ByteView der) {
    const std::optional<DeniedParts> parts = findParts(der);
    if (!parts) return false;
    signedParts_.insert(base::toString(parts->signedPart));
    keys_.insert(base::toString(parts->key));
    ++size_;
    return true;
}

bool DenyList::reaches(const X509Certificate& certificate) const {
    return keys_.contains(base::toString(certificate.subjectKey().identity)) ||
           signedParts_.contains(base::toString(certificate.parts().signedPart));
}

namespace {

/// Maximum lines for one file; further damaged blocks are counted.
constexpr std::size_t kMaximumReports = 16;

}  // namespace

bool contains(const CertificateList& list, const X509Certificate& certificate) {
    return std::any_of(list.begin(), list.end(),
                       [&](const X509CertificateRef& entry) { return entry->der() == certificate.der(); });
}

std::optional<CertificateList> readPem(ByteView text) {
    if (text.size() > kMaximumPemFileSize) return std::nullopt;
    CertificateList certificates;
    for (const PemBlock& block : readPemBlocks(base::asText(text))) {
        if (!block.data) return std::nullopt;
        if (!isCertificateBlock(block)) continue;
        X509CertificateRef certificate = X509Certificate::parse(*block.data);
        if (!certificate || certificates.size() == kMaximumCertificatesPerFile) return std::nullopt;
        certificates.push_back(std::move(certificate));
    }
    if (certificates.empty()) return std::nullopt;
    return certificates;
}

void readDeniedPem(ByteView text, DenyList& into, const std::function<void(const std::string&)>& report) {
    std::size_t certificates = 0;
    std::size_t damaged = 0;
    for (const PemBlock& block : readPemBlocks(base::asText(text))) {
        std::string_view damage = block.damage;
        if (block.data) {
            // OpenSSL's "trusted" form is a certificate with trailing data.
            if (!isCertificateBlock(block) && block.label != "TRUSTED CERTIFICATE") continue;
            if (X509CertificateRef certificate = X509Certificate::parse(*block.data)) {
                into.add(certificate);
                ++certificates;
                continue;
            }
            const bool hasKey = into.addUnreadable(*block.data);
            damage = hasKey ? "it is no proper certificate; its key is distrusted all the same"
                            : "it is no certificate";
        }
        if (++damaged <= kMaximumReports)
            report(values::format("the block at line %zu: %@", block.line, std::string(damage)));
    }
    if (damaged > kMaximumReports)
        report(values::format("%zu more blocks are damaged", damaged - kMaximumReports));
    if (certificates == 0 && damaged == 0) report("not a PEM file of certificates");
}

namespace {

using LogError = std::function<void(std::string_view)>;

/// Passes on the contents of each readable file.
void readFiles(const std::vector<std::string>& paths, std::size_t maximumSize, const LogError& logError,
               const std::function<void(const std::string& path, ByteView text)>& use) {
    for (const std::string& path : paths) {
        const base::Result<Data> text = base::readSmallFile(path, maximumSize);
        if (text) {
            use(path, *text);
        } else {
            logError(values::format("Could not read certificates. %@", text.error().localizedDescription()));
        }
    }
}

CertificateList loadFiles(const std::vector<std::string>& paths, const LogError& logError) {
    CertificateList certificates;
    readFiles(paths, kMaximumPemFileSize, logError, [&](const std::string& path, ByteView text) {
        if (const std::optional<CertificateList> read = readPem(text)) {
            certificates.insert(certificates.end(), read->begin(), read->end());
        } else {
            logError(
                values::format("Could not read certificates. %@: not a PEM file of certificates.", path));
        }
    });
    return certificates;
}

DenyList loadDenied(const std::vector<std::string>& paths, const LogError& logError) {
    DenyList denied;
    readFiles(paths, kMaximumDeniedFileSize, logError, [&](const std::string& path, ByteView text) {
        readDeniedPem(text, denied, [&](const std::string& reason) {
            logError(values::format("Could not read certificates. %@: %@.", path, reason));
        });
    });
    return denied;
}

}  // namespace

Anchors loadAnchors(const config::PlatformDirectory& directory, const LogError& logError) {
    return {loadFiles(directory.rootCertificateFiles(), logError),
            loadFiles(directory.compatibilityRootCertificateFiles(), logError),
            loadFiles(directory.userAllowedCertificateFiles(), logError),
            loadDenied(directory.userDeniedCertificateFiles(), logError)};
}

}  // namespace pinwell::trust
