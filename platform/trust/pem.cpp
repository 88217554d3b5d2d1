#include "trust/pem.h"

#include <algorithm>
#include <string>

#include "foundation/base64.h"
#include "foundation/utf8.h"

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
                     [](char c) { return !foundation::isSpace(c); });
        block.data = foundation::decodeBase64(base64);
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

}  // namespace pinwell::trust
