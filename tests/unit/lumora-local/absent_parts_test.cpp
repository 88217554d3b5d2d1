// The messages of a build without one of its optional parts; compiled only into such a build.
#include <gtest/gtest.h>

#include <functional>

#include "lumora-local/failure.h"
#include "lumora-local/metrics.h"
#include "lumora-local/service_directory.h"
#include "lumora-local/service_store.h"
#include "lumora-local/signing_key.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;

void expectConfigurationFailure(const std::function<void()>& work, const std::string& part) {
    try {
        work();
        ADD_FAILURE() << "nothing was refused";
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.exitStatus(), EX_CONFIG);
        EXPECT_NE(std::string(failure.what()).find(part), std::string::npos) << failure.what();
    }
}

#if PINWELL_WITHOUT_POSTGRESQL
TEST(WithoutPostgres, RefusesADatabaseAndNamesTheFile) {
    const TemporaryDirectory directory;
    const auto service = ServiceDirectory::create(directory / "service", {}, values::Date::now());
    writeFile(service.descriptionPath(),
              std::string_view(R"({"hosts":["localhost"],"store":"postgresql:///lumora"})"));
    const auto open = [&] { openStore(ServiceDirectory::open(service.path())); };
    expectConfigurationFailure(open, "built without PostgreSQL");
    expectConfigurationFailure(open, service.descriptionPath());
}

TEST(WithoutPostgres, RefusesToMigrate) {
    const TemporaryDirectory directory;
    const auto service = ServiceDirectory::create(directory / "service", {}, values::Date::now());
    expectConfigurationFailure([&] { migrate(service, "postgresql:///lumora"); }, "built without PostgreSQL");
}
#endif

#if PINWELL_WITHOUT_PKCS11
TEST(WithoutPkcs11, RefusesAKeyInAToken) {
    expectConfigurationFailure([] { openSigningKey("pkcs11:token=lumora?pin-value=1234", {}); },
                               "cannot use pkcs11:token=lumora: this program was built without PKCS #11");
}
#endif

#if PINWELL_WITHOUT_METRICS
TEST(WithoutMetrics, RefusesMetrics) {
    expectConfigurationFailure(requireMetrics, "cannot offer metrics: this program was built without them");
}
#endif

}  // namespace
}  // namespace pinwell::lumora
