// The C interface as a guest: used by several threads at once, without effects on the host process.
#include <dlfcn.h>
#include <pthread.h>
#include <sys/mman.h>
#include <unistd.h>

#include <atomic>
#include <clocale>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <thread>
#include <vector>

#include "c_handles.h"
#include "vector_artefacts.h"

namespace pinwell::test {
namespace {

const std::string kArtefacts = VECTORS_DIRECTORY "/artefacts/";
const std::vector<std::string> kGood = {kArtefacts + "Sample.app", kArtefacts + "Sample.dmg",
                                        kArtefacts + "Unsigned.dmg", kArtefacts + "Sample.pkg"};

std::size_t openDescriptors() {
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

std::size_t threads() {
    const std::filesystem::directory_iterator all("/proc/self/task");
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

TEST(CHost, UsesOneHandleFromManyThreads) {
    const CRoots roots = cRoots(VectorArtefacts::platform());
    const CResult shared = verified(kGood[0], roots);
    std::atomic<int> good = 0;
    std::vector<std::thread> running;
    for (std::size_t i = 0; i < 8; ++i) {
        running.emplace_back([&, i] {
            pinwell_options options = PINWELL_OPTIONS_INIT;
            options.threads = 2;
            const CResult own = verified(kGood[i % kGood.size()], roots, &options);
            pinwell_check check = PINWELL_CHECK_INIT;
            if (pinwell_result_verdict(own.get()) == PINWELL_VERDICT_GOOD &&
                pinwell_result_verdict(shared.get()) == PINWELL_VERDICT_GOOD &&
                pinwell_result_check(shared.get(), 0, &check) == PINWELL_OK)
                ++good;
        });
    }
    for (std::thread& thread : running) thread.join();
    EXPECT_EQ(good, 8);
}

TEST(CHost, FreesAHandleOnceHoweverManyThreadsFreeIt) {
    const CRoots roots = cRoots(VectorArtefacts::platform());
    for (int round = 0; round < 20; ++round) {
        pinwell_result* const result = judged(kGood[1], roots).release();
        std::atomic<int> freed = 0;
        std::vector<std::thread> running;
        for (int i = 0; i < 4; ++i) {
            running.emplace_back([&] {
                // A late call gets an error.
                static_cast<void>(pinwell_result_verdict(result));
                if (pinwell_result_free(result) == PINWELL_OK) ++freed;
            });
        }
        for (std::thread& thread : running) thread.join();
        EXPECT_EQ(freed, 1);
    }
}

TEST(CHost, LeavesNothingOpenAndNoThreadBehind) {
    const VectorArtefacts& artefacts = VectorArtefacts::shared();
    const CRoots roots = cRoots(VectorArtefacts::platform());
    verified(kGood[0], roots);
    const std::size_t descriptors = openDescriptors();
    const std::size_t before = threads();
    for (const Vector& vector : artefacts.all()) {
        verified(vector.path, roots);
        judged(vector.path, roots);
        pinwell_ticket* ticket = nullptr;
        pinwell_find_ticket(vector.path.c_str(), vector.path.size(), &ticket, nullptr);
        pinwell_ticket_free(ticket);
    }
    EXPECT_EQ(openDescriptors(), descriptors);
    EXPECT_EQ(threads(), before);
}

TEST(CHost, PrintsNothing) {
    const CRoots roots = cRoots(VectorArtefacts::platform());
    const VectorArtefacts& artefacts = VectorArtefacts::shared();
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();
    for (const Vector& vector : artefacts.all()) {
        verified(vector.path, roots);
        char name[PINWELL_RECORD_NAME_SIZE];
        pinwell_record_name_of_file(vector.path.c_str(), vector.path.size(), name, sizeof name, nullptr,
                                    nullptr);
    }
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

TEST(CHost, LeavesSignalsLocaleAndDirectoryAlone) {
    const auto handlers = [] {
        std::vector<void (*)(int)> all;
        for (int number = 1; number < SIGRTMIN; ++number) {
            struct sigaction now {};
            sigaction(number, nullptr, &now);
            all.push_back(now.sa_handler);
        }
        return all;
    };
    const auto mask = [] {
        sigset_t now;
        pthread_sigmask(SIG_SETMASK, nullptr, &now);
        std::string bits;
        for (int number = 1; number < SIGRTMIN; ++number) bits += sigismember(&now, number) != 0 ? '1' : '0';
        return bits;
    };
    const auto handlersBefore = handlers();
    const std::string maskBefore = mask();
    const std::string localeBefore = setlocale(LC_ALL, nullptr);
    const auto directoryBefore = std::filesystem::current_path();
    int cancelBefore = 0;
    pthread_setcancelstate(PTHREAD_CANCEL_ENABLE, &cancelBefore);
    const CRoots roots = cRoots(VectorArtefacts::platform());
    for (const std::string& path : kGood) verified(path, roots);
    EXPECT_EQ(handlers(), handlersBefore);
    EXPECT_EQ(mask(), maskBefore);
    EXPECT_EQ(setlocale(LC_ALL, nullptr), localeBefore);
    EXPECT_EQ(std::filesystem::current_path(), directoryBefore);
    int cancelAfter = 0;
    pthread_setcancelstate(cancelBefore, &cancelAfter);
    EXPECT_EQ(cancelAfter, PTHREAD_CANCEL_ENABLE);
}

TEST(CHost, LoadsNoDesktopLibraryForAnExtensionThatItDoesNotKnow) {
    const TemporaryDirectory directory;
    writeFile(directory / "notes.txt", std::string_view("text\n"));
    const CRoots roots = cRoots(VectorArtefacts::platform());
    const CResult result = judged(directory / "notes.txt", roots);
    EXPECT_EQ(pinwell_result_kind(result.get()), PINWELL_KIND_NONE);
    EXPECT_EQ(dlopen("libgio-2.0.so.0", RTLD_NOLOAD | RTLD_LAZY), nullptr);
}

TEST(CHost, StaysLoadedAfterItWasClosed) {
    void* const library = dlopen(LIBRARY_FILE, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(library, nullptr) << dlerror();
    using Version = std::uint32_t (*)();
    const auto version = reinterpret_cast<Version>(dlvsym(library, "pinwell_version", "PINWELL_TICKET_0.2"));
    ASSERT_NE(version, nullptr) << dlerror();
    EXPECT_EQ(dlsym(library, "satchel_decode_header"), nullptr);
    dlclose(library);
    EXPECT_EQ(version(), static_cast<std::uint32_t>(PINWELL_TICKET_VERSION));
}

}  // namespace
}  // namespace pinwell::test
