// Fetches or downloads a URL and ends the process from the callback: with status 7, whatever the result; with
// status 3 after an error. The main thread only waits, and other threads live on until the very end.
#include <cstdlib>
#include <cstring>
#include <memory>

#include "https/session.h"
#include "runtime/queue.h"
#include "support/fake_trust_service.h"
#include "values/url.h"

namespace {

using namespace pinwell;

constexpr int kDone = 7;
constexpr int kFailed = 3;

class ExitingDelegate : public https::SessionDelegate {
  public:
    bool endsAtTheChallenge = false;

    void didReceiveChallenge(https::Session&, const https::AuthenticationChallenge& challenge,
                             const https::ChallengeCompletion& completion) override {
        if (endsAtTheChallenge) std::exit(kDone);
        completion(https::Disposition::useCredential, https::Credential{challenge.serverTrust});
    }
    void didFinishDownloading(https::Session&, https::Task&, const values::URL&) override {
        std::exit(kDone);
    }
    void didComplete(https::Session&, https::Task&, const std::optional<base::Error>&) override {
        std::exit(kFailed);
    }
};

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) return 64;
    const std::string_view mode = argv[1];
    https::Request request;
    request.url = values::URL::fromString(argv[2]);

    test::FakeTrustService trust;
    const auto service = https::makeSessionService(trust);
    ExitingDelegate delegate;
    delegate.endsAtTheChallenge = mode == "challenge";
    const auto first = *service->ephemeralSession(delegate);
    const auto second = *service->ephemeralSession(delegate);

    std::shared_ptr<https::Task> download;
    const auto lookup = first->dataTask(request, [&](const auto&, const auto&, const auto& error) {
        if (error) std::exit(kFailed);
        if (mode != "download") std::exit(kDone);
        download = second->downloadTask(request);
        download->resume();
    });
    lookup->resume();
    if (mode == "several") first->dataTask(request, {})->resume();
    runtime::RunLoop loop;
    loop.run();
    return 1;
}
