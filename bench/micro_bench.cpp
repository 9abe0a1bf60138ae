// How long parts of the agent take, each on its own.
#include <benchmark/benchmark.h>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/host/host.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/files.h"
#include "vrx/platform/json.h"
#include "vrx/platform/property_list.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/scheduling/post_date.h"
#include "vrx/scheduling/refresh_date.h"
#include "vrx/service/agent.h"
#include "vrx/service/register_defaults.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using platform::Dictionary;
using platform::Platform;
using platform::Value;

constexpr const char* serialNumber = "BENCH0001";

// As large as a server's answer is: some 60 keys, two of them with entries of their own.
Value coverage() {
    Dictionary record{
        {"covered", true},
        {"coverageEndDate", 1900000000},
        {"qxOfferEligible", true},
        {"qxOfferEligibleUntil", 1900000000},
        {"featureToggleParameters", Dictionary{{"qxOfferDisplay", true}, {"qxOfferDurationDaysBeforeEndDate", 30}}},
        {"coverage", Dictionary{{"localizedCoverageTitle", "Coverage"}, {"benefitsCard", Dictionary{}}}}};
    for (int i = 0; i < 50; ++i) record["localizedText" + std::to_string(i)] = std::string(60, 'x');
    return record;
}

// A real host in a folder of its own, signed in, with one record in the cache.
class RealHost {
public:
    RealHost() {
        host_.open(host::HomeUse::Agent);
        vrx_registerDefaults(Platform::current().defaultsStore());
        VRXWarranty::warrantyWithDictionary(coverage())->cacheWarranty(std::string(serialNumber));
    }

private:
    std::string home_ = [] {
        std::string pattern = "/tmp/vrx-bench-XXXXXX";
        return std::string(mkdtemp(pattern.data()));
    }();
    host::Host host_{{.home = home_, .profile = {}}, platform::Level::Error};
};

void buildRecord(benchmark::State& state) {
    RealHost host;
    const Value dictionary = coverage();
    for (auto _ : state) benchmark::DoNotOptimize(VRXWarranty::initWithDictionary(dictionary));
}
BENCHMARK(buildRecord);

void writeCache(benchmark::State& state) {
    RealHost host;
    auto warranty = VRXWarranty::warrantyWithDictionary(coverage());
    for (auto _ : state) warranty->cacheWarranty(std::string(serialNumber));
}
BENCHMARK(writeCache);

void readCache(benchmark::State& state) {
    RealHost host;
    for (auto _ : state)
        benchmark::DoNotOptimize(VRXWarranty::cachedWarrantyForSerialNumber(std::string(serialNumber)));
}
BENCHMARK(readCache);

void policyLookup(benchmark::State& state) {
    RealHost host;
    auto agent = VRXAgent::initWithCallingProcessBundleID("com.orvane.bench");
    for (auto _ : state)
        agent->getWarrantyUsingPolicy(
            VRXWarrantyLookupPolicyCachedOnly, std::string(serialNumber),
            [](const std::shared_ptr<VRXWarranty>& warranty) { benchmark::DoNotOptimize(warranty); });
}
BENCHMARK(policyLookup);

// 100 devices whose records come from files.
void refreshHundredDevices(benchmark::State& state) {
    sim::Host host;
    host.log.lowest = platform::Level::Error;
    vrx_registerDefaults(host.defaults);
    host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
    host.defaults.set("WarrantyURL", "file:///data/Warranty.plist");
    const auto file = host.propertyList.serialize(coverage(), platform::PropertyListFormat::Binary).value();
    host.files.put("/data/Warranty.plist", std::string(file.begin(), file.end()));
    for (int i = 0; i < 99; ++i)
        host.watches.all.push_back({"Watch", {}, "WATCH" + std::to_string(i), platform::dateFromEpoch(5), true, false});
    auto agent = VRXAgent::initWithCallingProcessBundleID("com.orvane.bench");
    for (auto _ : state) {
        std::size_t count = 0;
        agent->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyRefresh, false,
                                            [&](const DeviceInfoList& infos) { count = infos.size(); });
        host.runFor(platform::Duration(1));
        if (count != 100) state.SkipWithError("not all devices were answered");
    }
}
BENCHMARK(refreshHundredDevices)->Unit(benchmark::kMillisecond);

// Watches whose offers end on different days; every other one has its follow-up.
struct ThousandDevices {
    sim::Host host;
    platform::Date now = host.clock.now();
    DeviceInfoList infos;
    PostDateSettings settings{{}, platform::Duration(2 * 86400)};

    ThousandDevices() {
        for (int i = 0; i < 1000; ++i) {
            const std::string serial = "WATCH" + std::to_string(i);
            auto warranty = VRXWarranty::warrantyWithDictionary(Dictionary{});
            warranty->setQxOfferDisplay(true);
            warranty->setQxOfferEligibleUntil(now + std::chrono::hours(24 + i));
            auto watch = VRXDevice::deviceWithName("Watch", serial, now - std::chrono::hours(i), VRXDeviceTypeWatch);
            infos.push_back(VRXDeviceInfo::deviceInfoWithDevice(std::move(watch), std::move(warranty)));
            if (i % 2) settings.postedSerialNumberHashes.insert(platform::sha256Hash(serial));
        }
    }
};

void postDateOfThousandDevices(benchmark::State& state) {
    const ThousandDevices devices;
    for (auto _ : state) benchmark::DoNotOptimize(nextPostDate(devices.infos, devices.settings, devices.now));
}
BENCHMARK(postDateOfThousandDevices)->Unit(benchmark::kMicrosecond);

void refreshDateOfThousandDevices(benchmark::State& state) {
    const ThousandDevices devices;
    const RefreshDateSettings settings{platform::Duration(86400), devices.settings.outreachDelay};
    for (auto _ : state) benchmark::DoNotOptimize(nextRefreshDate(devices.infos, true, settings, devices.now));
}
BENCHMARK(refreshDateOfThousandDevices)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace vrx

BENCHMARK_MAIN();
