#include "lumora-local/key_file.h"

#include <fcntl.h>
#include <malloc.h>
#include <openssl/crypto.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "foundation/error.h"
#include "foundation/file_io.h"

namespace pinwell::lumora {
namespace {

constexpr std::size_t kMaximumKeyFile = std::size_t{64} * 1024;

// Room that is wiped when it goes.
class WipedBuffer {
  public:
    WipedBuffer() = default;
    ~WipedBuffer() { OPENSSL_cleanse(bytes_.data(), bytes_.size()); }
    WipedBuffer(const WipedBuffer&) = delete;
    WipedBuffer& operator=(const WipedBuffer&) = delete;

    std::byte* data() noexcept { return bytes_.data(); }
    static constexpr std::size_t size() noexcept { return kMaximumKeyFile + 1; }

  private:
    std::array<std::byte, kMaximumKeyFile + 1> bytes_{};
};

// Returns the number of bytes, or throws.
std::size_t readInto(WipedBuffer& buffer, const std::string& path) {
    const auto fail = [&](int reason) {
        throw Failure(EX_NOINPUT, foundation::Error::posix(reason, path).localizedDescription());
    };
    const foundation::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    if (!file) fail(errno);
    std::size_t length = 0;
    while (length < WipedBuffer::size()) {
        const ssize_t count = ::read(file.get(), buffer.data() + length, WipedBuffer::size() - length);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) fail(errno);
        if (count == 0) return length;
        length += static_cast<std::size_t>(count);
    }
    fail(EFBIG);
    return 0;
}

void* allocate(std::size_t size, const char*, int) {
    return std::malloc(size);
}

void release(void* memory, const char*, int) {
    if (memory == nullptr) return;
    OPENSSL_cleanse(memory, malloc_usable_size(memory));
    std::free(memory);
}

// Not by realloc(3), which leaves the old place as it is when it moves.
void* reallocate(void* memory, std::size_t size, const char* file, int line) {
    void* const moved = size == 0 ? nullptr : std::malloc(size);
    if (memory == nullptr) return moved;
    if (size != 0 && moved == nullptr) return nullptr;
    if (moved != nullptr) std::memcpy(moved, memory, std::min(size, malloc_usable_size(memory)));
    release(memory, file, line);
    return moved;
}

}  // namespace

bool wipeWhatOpenSSLFrees() noexcept {
    return CRYPTO_set_mem_functions(allocate, reallocate, release) == 1;
}

KeyHandle readKeyFile(const std::string& path) {
    WipedBuffer buffer;
    const auto length = static_cast<int>(readInto(buffer, path));
    // Reads from the buffer itself, and copies nothing.
    const BioHandle pem(BIO_new_mem_buf(buffer.data(), length));
    require(pem != nullptr, "read a PEM file");
    KeyHandle key(PEM_read_bio_PrivateKey(pem.get(), nullptr, nullptr, nullptr));
    require(key != nullptr, "read the key in " + path);
    return key;
}

void wipe(std::string& text) {
    OPENSSL_cleanse(text.data(), text.size());
    text.clear();
}

}  // namespace pinwell::lumora
