#include "signing_key.h"

#include <openssl/ec.h>
#include <openssl/obj_mac.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <exception>
#include <mutex>
#include <system_error>

#include "base/handle.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "key_file.h"
#include "openssl.h"
#include "service_settings.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::Data;
using base::FileDescriptor;
using OpenKey = std::function<std::unique_ptr<DigestSigner>()>;

// A request is the digest to sign. A response is one byte with an exit status, two bytes with the length of
// the rest (little-endian), and the rest: a signature or the text of a failure. The child first sends a
// response with the public key.
constexpr std::size_t kDigestSize = 32;
constexpr std::size_t kAnswerHead = 3;
constexpr std::size_t kMaximumAnswer = 4096;

timeval toTimeval(std::chrono::milliseconds time) {
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(time);
    return {seconds.count(), std::chrono::microseconds(time - seconds).count()};
}

/// Returns false at the end of the stream, and if it fails.
bool readFully(int descriptor, std::byte* room, std::size_t size) {
    while (size > 0) {
        const ssize_t count = ::read(descriptor, room, size);
        if (count < 0 && errno == EINTR) continue;
        if (count <= 0) return false;
        room += count;
        size -= static_cast<std::size_t>(count);
    }
    return true;
}

bool writeFully(int descriptor, ByteView bytes) {
    while (!bytes.empty()) {
        // A lost peer is an error here, even if the process does not ignore SIGPIPE.
        const ssize_t count = ::send(descriptor, bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (count < 0 && errno == EINTR) continue;
        if (count <= 0) return false;
        bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return true;
}

bool sendAnswer(int descriptor, int status, ByteView bytes) {
    bytes = bytes.first(std::min(bytes.size(), kMaximumAnswer));
    Data answer{static_cast<std::byte>(status), static_cast<std::byte>(bytes.size() & 0xFFU),
                static_cast<std::byte>(bytes.size() >> 8U)};
    base::append(answer, bytes);
    return writeFully(descriptor, answer);
}

template <class Work>
bool answerWith(int descriptor, Work&& work) {
    try {
        return sendAnswer(descriptor, EX_OK, work());
    } catch (const Failure& failure) {
        return sendAnswer(descriptor, failure.exitStatus(), base::asBytes(failure.what()));
    } catch (const std::exception& error) {
        return sendAnswer(descriptor, EX_SOFTWARE, base::asBytes(error.what()));
    }
}

/// The whole work of the child.
void serveToken(int descriptor, const OpenKey& open) {
    std::unique_ptr<DigestSigner> key;
    const bool sent = answerWith(descriptor, [&] {
        key = open();
        return key->publicKey();
    });
    std::array<std::byte, kDigestSize> digest{};
    while (sent && key != nullptr && readFully(descriptor, digest.data(), digest.size())) {
        if (!answerWith(descriptor, [&] { return key->signDigest(digest); })) return;
    }
}

class KeyBehindProcess final : public SigningKey {
  public:
    KeyBehindProcess(const OpenKey& open, std::chrono::milliseconds patience) {
        std::array<int, 2> ends{};
        if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0) failStarting();
        ours_ = FileDescriptor(ends[0]);
        FileDescriptor theirs(ends[1]);
        child_ = ::fork();
        if (child_ < 0) failStarting();
        if (child_ == 0) {
            ours_.reset();
            serveToken(theirs.get(), open);
            ::_exit(EX_OK);
        }
        theirs.reset();
        try {
            publicKey_ = receive();
            const timeval limit = toTimeval(patience);
            ::setsockopt(ours_.get(), SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof limit);
        } catch (const Failure&) {
            end();
            throw;
        }
    }

    ~KeyBehindProcess() override { end(); }
    KeyBehindProcess(const KeyBehindProcess&) = delete;
    KeyBehindProcess& operator=(const KeyBehindProcess&) = delete;

    Data publicKey() const override { return publicKey_; }

    Data sign(ByteView message) const override {
        const Data digest = crypto::sha256(message);
        const std::lock_guard lock(mutex_);
        if (!ours_ || !writeFully(ours_.get(), digest)) failTalking();
        return receive();
    }

  private:
    [[noreturn]] static void failStarting() {
        throw Failure(EX_OSERR, values::format("cannot start the process that signs: %@",
                                               std::generic_category().message(errno)));
    }
    [[noreturn]] static void failTalking() {
        throw Failure(EX_IOERR, "the process that speaks to the token has ended, or does not answer");
    }

    /// No request follows a late response. So it is never taken for the response to another request.
    [[noreturn]] void giveUp() const {
        ours_.reset();
        failTalking();
    }

    Data receive() const {
        std::array<std::byte, kAnswerHead> head{};
        if (!readFully(ours_.get(), head.data(), head.size())) giveUp();
        const std::size_t size = std::to_integer<std::size_t>(head[1]) | std::to_integer<std::size_t>(head[2])
                                                                             << 8U;
        if (size > kMaximumAnswer) giveUp();
        Data bytes(size);
        if (!readFully(ours_.get(), bytes.data(), size)) giveUp();
        const int status = std::to_integer<int>(head[0]);
        if (status != EX_OK) throw Failure(status, base::toString(bytes));
        return bytes;
    }

    /// The child ends when its socket is closed. A child whose token does not respond is killed and not
    /// waited for, because a device driver may block it.
    void end() {
        const bool answers = static_cast<bool>(ours_);
        ours_.reset();
        if (!answers) {
            if (child_ > 0) ::kill(child_, SIGKILL);
            return;
        }
        while (child_ > 0 && ::waitpid(child_, nullptr, 0) < 0 && errno == EINTR) continue;
    }

    mutable std::mutex mutex_;
    mutable FileDescriptor ours_;
    pid_t child_ = -1;
    Data publicKey_;
};

}  // namespace

std::unique_ptr<SigningKey> startSigningProcess(const std::function<std::unique_ptr<DigestSigner>()>& open,
                                                std::chrono::milliseconds patience) {
    return std::make_unique<KeyBehindProcess>(open, patience);
}

namespace {

// DER of two integers of 33 bytes with their headers.
constexpr std::size_t kMaximumSignature = 72;

class KeyFromFile final : public SigningKey {
  public:
    explicit KeyFromFile(KeyHandle key) : key_(std::move(key)) {}

    Data publicKey() const override {
        return encodeDer<EVP_PKEY>(i2d_PUBKEY, key_.get(), "encode a public key");
    }

    Data sign(ByteView message) const override {
        const crypto::DigestContextHandle context(EVP_MD_CTX_new());
        Data signature(kMaximumSignature);
        std::size_t length = signature.size();
        require(context != nullptr &&
                    EVP_DigestSignInit(context.get(), nullptr, EVP_sha256(), nullptr, key_.get()) == 1 &&
                    EVP_DigestSign(context.get(), unsignedBytes(signature), &length, unsignedBytes(message),
                                   message.size()) == 1,
                "sign a ticket");
        signature.resize(length);
        return signature;
    }

  private:
    KeyHandle key_;
};

bool isOnP256(EVP_PKEY* key) {
    std::array<char, 64> group{};
    std::size_t length = 0;
    return EVP_PKEY_get_base_id(key) == EVP_PKEY_EC &&
           EVP_PKEY_get_group_name(key, group.data(), group.size(), &length) == 1 &&
           std::string_view(group.data()) == SN_X9_62_prime256v1;
}

}  // namespace

std::unique_ptr<SigningKey> openSigningKey(const std::string& key, const std::string& passphraseFile) {
    if (isTokenKey(key)) return startSigningProcess([&key] { return openTokenKey(key); });
    KeyHandle read = readKeyFile(key, passphraseFile);
    if (!isOnP256(read.get())) {
        throw Failure(EX_CONFIG,
                      values::format("the key in %@ is no EC key on P-256, as tickets need it", key));
    }
    return std::make_unique<KeyFromFile>(std::move(read));
}

}  // namespace pinwell::lumora
