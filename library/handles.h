// Objects that programs in C hold by a number that looks like a pointer. For this folder only.
//
// The number is never an address, and never used again. So the use of a freed handle, or of a handle of
// another type, is detected here. The number is odd; no address of an object is.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <unordered_map>
#include <utility>

namespace pinwell::library {

/// A number that no handle of any type has had.
std::uintptr_t nextHandleNumber() noexcept;

/// All live objects of one type. From any thread.
template <class Handle, class Object>
class HandleTable {
  public:
    /// One table for each type. It is never destroyed: threads may still call while the process ends.
    static HandleTable& shared() {
        static HandleTable* const table = new HandleTable;  // NOLINT(*-owning-memory)
        return *table;
    }

    /// Throws std::bad_alloc.
    Handle* add(std::shared_ptr<const Object> object) {
        const std::lock_guard lock(mutex_);
        while (true) {
            const std::uintptr_t number = nextHandleNumber();
            if (objects_.try_emplace(number, object).second) return handleOf(number);
        }
    }

    /// Null if there is no such object. It lives at least as long as the result.
    std::shared_ptr<const Object> find(const Handle* handle) const noexcept {
        const std::lock_guard lock(mutex_);
        const auto found = objects_.find(numberOf(handle));
        return found == objects_.end() ? nullptr : found->second;
    }

    /// Returns false if there is no such object.
    bool remove(const Handle* handle) noexcept {
        std::shared_ptr<const Object> removed;  // destroyed without the lock
        const std::lock_guard lock(mutex_);
        const auto found = objects_.find(numberOf(handle));
        if (found == objects_.end()) return false;
        removed = std::move(found->second);
        objects_.erase(found);
        return true;
    }

  private:
    static std::uintptr_t numberOf(const Handle* handle) noexcept {
        return reinterpret_cast<std::uintptr_t>(handle);
    }
    static Handle* handleOf(std::uintptr_t number) noexcept {
        return reinterpret_cast<Handle*>(number);  // NOLINT(performance-no-int-to-ptr)
    }

    mutable std::mutex mutex_;
    std::unordered_map<std::uintptr_t, std::shared_ptr<const Object>> objects_;
};

}  // namespace pinwell::library
