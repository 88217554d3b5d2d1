// ticket-info TICKET ROOTS [CDHASH]: shows a ticket and says whether it is genuine.
//
// TICKET is a ticket by itself, a disk image (*.dmg) or a flat package (*.pkg); ROOTS a file of certificates
// (PEM or DER) or a platform directory; CDHASH hexadecimal digits. Ends with 0 when the ticket is genuine, is
// not marked revoked and lists the hash if one is given; with 65 when it is not acceptable, 66 when there is
// none to read, 64 otherwise.
#include <pinwell/ticket.h>

#include <charconv>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>

namespace {

namespace ticket = pinwell::ticket;

constexpr int kAcceptable = 0;
constexpr int kUsage = 64;
constexpr int kNotAcceptable = 65;
constexpr int kNoTicket = 66;

std::optional<ticket::Bytes> readWhole(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    if (!file) return std::nullopt;
    const std::string text{std::istreambuf_iterator<char>(file), {}};
    const auto bytes = std::as_bytes(std::span(text));
    return ticket::Bytes(bytes.begin(), bytes.end());
}

std::string toHex(ticket::ByteView bytes) {
    constexpr std::string_view kDigits = "0123456789abcdef";
    std::string text;
    for (const std::byte byte : bytes) {
        text += kDigits[std::to_integer<unsigned>(byte >> 4)];
        text += kDigits[std::to_integer<unsigned>(byte & std::byte{15})];
    }
    return text;
}

std::optional<ticket::Bytes> fromHex(std::string_view text) {
    ticket::Bytes bytes;
    for (; text.size() >= 2; text.remove_prefix(2)) {
        unsigned char byte = 0;
        const auto [end, error] = std::from_chars(text.data(), text.data() + 2, byte, 16);
        if (error != std::errc() || end != text.data() + 2) return std::nullopt;
        bytes.push_back(std::byte{byte});
    }
    return text.empty() && !bytes.empty() ? std::optional(bytes) : std::nullopt;
}

/// The ticket in an image or a package; says why there is none.
template <class Artefact>
std::optional<ticket::Bytes> ticketOf(ticket::Result<Artefact> result) {
    if (!result) {
        std::cout << "unreadable at " << result.error().offset << ": " << result.error().message << "\n";
        return std::nullopt;
    }
    auto& found = result->ticket;
    if (!found) {
        std::cout << "no ticket\n";
        return std::nullopt;
    }
    std::cout << "ticket of " << found->range.length << " bytes at " << found->range.offset << "\n";
    return std::move(found->bytes);
}

std::optional<ticket::Bytes> ticketAt(const std::string& path) {
    const auto extension = std::filesystem::path(path).extension();
    if (extension == ".dmg") return ticketOf(ticket::readDiskImage(path));
    if (extension == ".pkg") return ticketOf(ticket::readFlatPackage(path));
    auto bytes = readWhole(path);
    if (!bytes) std::cout << "unreadable: " << path << "\n";
    return bytes;
}

std::optional<ticket::TrustedRoots> rootsAt(const std::string& path) {
    if (std::filesystem::is_directory(path)) return ticket::TrustedRoots::fromPlatformDirectory(path);
    auto result = ticket::TrustedRoots::fromCertificates(readWhole(path).value_or(ticket::Bytes{}));
    if (!result) {
        std::cout << "no roots: " << result.error().message << "\n";
        return std::nullopt;
    }
    return *std::move(result);
}

void show(const ticket::Bytes& bytes) {
    const auto container = ticket::decodeContainer(bytes);
    if (!container) return;
    std::cout << "version " << container->version << ", " << container->certificates.size()
              << " certificates\n";
    const auto payload = ticket::decodePayload(container->payload);
    if (!payload) return;
    for (std::uint64_t i = 0; i < payload->entryCount; ++i)
        if (const auto entry = ticket::entryAt(*payload, i))
            std::cout << "lists " << entry->algorithm << "/" << toHex(entry->hash) << "\n";
}

}  // namespace

int main(int count, char** arguments) {
    if (count < 3 || count > 4) {
        std::cerr << "usage: ticket-info TICKET ROOTS [CDHASH]\n";
        return kUsage;
    }
    const auto cdhash = count == 4 ? fromHex(arguments[3]) : ticket::Bytes{};
    const auto roots = rootsAt(arguments[2]);
    if (!cdhash || !roots) return kUsage;
    const auto bytes = ticketAt(arguments[1]);
    if (!bytes) return kNoTicket;
    show(*bytes);

    const ticket::ByteView wanted[] = {*cdhash};
    const auto validation = ticket::validate(*bytes, *roots, std::time(nullptr), wanted);
    if (!validation.isGenuine) {
        std::cout << "not genuine: " << validation.reason << " (offset " << validation.offset << ", verdict "
                  << static_cast<std::uint32_t>(validation.verdict) << ")\n";
        return kNotAcceptable;
    }
    std::cout << "genuine" << (validation.isRevoked ? ", revoked" : "");
    if (!cdhash->empty())
        std::cout << (validation.isListed ? ", lists the hash" : ", does not list the hash");
    std::cout << "\n";
    const bool isAcceptable = !validation.isRevoked && (cdhash->empty() || validation.isListed);
    return isAcceptable ? kAcceptable : kNotAcceptable;
}
