// What a client gets, what is cached afterwards and what went over the wire, whatever coverage server, network, account
// and credential helper do. The agent runs on its real host, with transfers and helper limited to half a second;
// clients reach it through its socket, and the server is a process of its own.
#include <malloc.h>

#include <algorithm>
#include <future>
#include <thread>

#include "end_to_end/coverage_server.h"
#include "vrx/client/agent_connection.h"
#include "vrx/codec/json.h"
#include "vrx/codec/property_list.h"
#include "vrx/coverage/cache_metadata.h"
#include "vrx/host/host.h"
#include "vrx/host/ipc/bundle_lookup.h"
#include "vrx/host/ipc/service_listener.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/service/start_up.h"

namespace vrx::end_to_end {
namespace {

using platform::Platform;

constexpr Duration timeLimit = 1000ms;
constexpr const char* serialNumber = "VRXPHONE0001";
constexpr std::string_view metadataKeys[] = {cachedWarrantyLastUpdatedDateKey, cachedWarrantyLocaleKey,
                                             cachedWarrantyVersionKey};
// In KiB, of agent and client together. The most that a document may hold, 100,000 values, takes 40 MiB as what is
// read, filed, sent and received of it; 8 MiB of texts, for which a document of 25 KB can stand, take 17 MiB.
constexpr long mostMemory = 64 * 1024;
// In bytes. An answer is shown twice, in 16 KiB at most each time; all other lines take 10 KiB.
constexpr std::size_t longestLog = 64 * 1024;
constexpr const char* signedIn = "identifier = 'maya@orvane.example'\nalt_dsid = '000001-02'\n";

class Network : public AtPlace {
protected:
    // A profile of a phone and two watches that entitles this program; the lines are its account's. The time zone is
    // its own: the thread sanitizer does not see that the C library guards the machine's.
    void useAccount(const std::string& lines) const {
        place_.write(
            "device.toml",
            "[device]\nserial_number = 'VRXPHONE0001'\nproduct_type = 'Phone12,3'\nproduct_version = '18.1'\n"
            "[locale]\ntime_zone = 'Asia/Kathmandu'\n"
            "[features.Vireo]\nMeridian_3_0 = true\n"
            "[[watches]]\nserial_number = 'VRXWATCH0001'\n[[watches]]\nserial_number = 'VRXWATCH0002'\n"
            "[[bundles]]\nexecutables = ['" +
                std::filesystem::read_symlink("/proc/self/exe").string() +
                "']\nidentifier = 'com.orvane.tests'\n"
                "[bundles.entitlements]\n'com.orvane.private.vrxagent' = true\n" +
                (lines.empty() ? "" : "[account]\ncredential_helper = ['" + place_ / "helper" + "']\n" + lines));
    }
    // The credential helper, a script.
    void useHelper(const std::string& script) const {
        place_.write("helper", "#!/bin/sh\n" + script + "\n");
        place_.setMode("helper", 0700);
    }
    void serveRecord(int round) const {
        place_.write("records/default.json", R"({"covered": true, "round": )" + std::to_string(round) + "}");
    }
    // In KiB, since the last reset.
    static long peakMemory() {
        const std::string status = fileText("/proc/self/status"), name = "VmHWM:";
        return std::stol(status.substr(status.find(name) + name.size()));
    }
    static void resetPeakMemory() {
        malloc_trim(0);  // what the test itself has used
        std::ofstream("/proc/self/clear_refs") << 5;
    }
    static void setDefault(std::string_view key, Value value) {
        Platform::current().defaultsStore().set(std::string(key), std::move(value));
    }

    // What is cached for this device: the file, and then the metadata in the order of their keys.
    std::vector<Value> cached() const {
        std::vector<Value> cached{fileText(place_ / "home/Library/Application Support/com.orvane.Vireo/" +
                                           platform::sha256Hash(serialNumber) + "_Warranty.plist")};
        for (std::string_view key : metadataKeys)
            cached.push_back(Platform::current().defaultsStore().get(cacheMetadataKey(serialNumber, key)));
        return cached;
    }

    std::optional<CoverageServer> server;
    std::optional<client::AgentConnection> clients;

    // An agent that has refreshed its record once.
    void SetUp() override {
        setenv("no_proxy", "*", 1);  // nothing leaves this machine
        if (!host::isSanitized) dup2(log_.number(), 2);
        serveRecord(1);
        server.emplace(place_.path(),
                       Arguments{"--quiet", "--records", place_ / "records", "--cache-control", "no-store"});
        useHelper("exec '" VRX_SOURCE "/examples/credential-helper' " + server->url());
        useAccount(signedIn);
        std::promise<void> isReady;
        thread_ = std::thread([&] { runAgent(isReady); });
        isReady.get_future().wait();
        setDefault("WarrantyURL", server->url() + "/api/v2/coverage/summary");
        setDefault("ServerVersionURL", server->url() + "/library/ORVANE/asset/vrxV2.plist");
        clients.emplace(client::ConnectionOptions{.socketPath = place_ / "socket"});
        ASSERT_TRUE((*clients->getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicyRefresh))->warranty());
        EXPECT_EQ(server->requests(3), "s200 t200 c1:200");
        server->ask("DELETE", "/requests");
        server->ask("DELETE", "/counters");
        serveRecord(2);
    }
    void TearDown() override {
        clients.reset();
        loop_->stop();
        mayEnd_.set_value();  // the loop is of no more use to this thread
        thread_.join();
        dup2(errors_.number(), 2);
        const std::string logged = fileText(place_ / "log");
        EXPECT_LT(logged.size(), longestLog);
        if (HasFailure()) std::cerr << logged;
    }

private:
    // As the agent's main thread.
    void runAgent(std::promise<void>& isReady) {
        host::Host host({.home = place_ / "home", .profile = {place_ / "device.toml"}}, platform::Level::Default,
                        {.http = {.longestTimeout = timeLimit}, .credentialHelper = timeLimit});
        EXPECT_FALSE(host.open(host::HomeUse::Agent));
        host::BundleLookup bundles([&] { return host.profile().content(); });
        host::ServiceListenerFactory factory(host.mainLoop().event(), bundles, host.lifecycle());
        EXPECT_FALSE(factory.open(place_ / "socket"));
        host.setBundleLookup(&bundles);
        host.setServiceListenerFactory(&factory);
        const StartUp startUp;
        loop_ = &host.mainLoop();
        isReady.set_value();
        loop_->run();
        mayEnd_.get_future().wait();
    }

    // The log goes to a file, but what sanitizers find does not.
    const host::Descriptor errors_{fcntl(2, F_DUPFD_CLOEXEC, 0)};
    const host::Descriptor log_{open((place_ / "log").c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600)};
    host::MainLoop* loop_ = nullptr;
    std::promise<void> mayEnd_;
    std::thread thread_;
};

enum class Outcome {
    NewRecord,
    NoRecord,       // what was cached stays as it was
    RecordUnfiled,  // delivered, and its metadata written, but not its file
};
using enum Outcome;

// What is other than usual.
struct Change {
    const char* warrantyURL = nullptr;
    const char* serverVersionURL = nullptr;
    const char* document = nullptr;  // of the server-version document
    const char* helper = nullptr;    // empty: there is none
    const char* account = nullptr;
    std::string (*file)() = nullptr;  // what stands at fromFile
    bool isLong = false;              // takes the whole time limit
};

struct Fault {
    const char* name;
    const char* faults;    // of the server
    const char* requests;  // that the server saw, as CoverageServer::requests() gives them
    Outcome outcome;
    Change change{};
};

std::ostream& operator<<(std::ostream& stream, const Fault& fault) {
    return stream << fault.name;
}

const char* const refusing = "http://127.0.0.1:1/";
// No host's name is that long: no resolver asks another machine for it.
const char* const nowhere = "https://0123456789012345678901234567890123456789012345678901234567890123.invalid/";
const char* const untrusted = "";  // a server with a certificate of its own making
const char* const fromFile = "file";
const char* const hangs = "sleep 1000 & wait";
const char* const babbles = "head -c 1000 /dev/urandom";
const char* const withoutToken = "identifier = 'ada@orvane.example'\nalt_dsid = '000002-03'\n";
const char* const withoutAltDSID = "identifier = 'maya@orvane.example'\n";

// A property list whose texts are one, with a reference of two bytes each.
template <std::size_t uses, std::size_t bytes>
std::string sharing() {
    const Value texts = Array(uses, Value(std::string(bytes, 'x')));
    const Data document =
        codec::serializePropertyList(Dictionary{{"round", 2}, {"texts", texts}}, platform::PropertyListFormat::Binary)
            .value();
    return {document.begin(), document.end()};
}
std::string deep() {
    std::string document = "<plist>";
    for (int i = 0; i < 100'000; ++i) document += "<array>";
    return document;
}
std::string many() {
    Dictionary entries{{"round", 2}};
    for (int i = 0; i < 90'000; ++i) entries["key" + std::to_string(i)] = i;
    return host::propertyList(entries);
}
std::string huge() {
    return std::string(100 << 20, 'x');
}

const Fault faults[] = {
    {"Unauthorized", "coverage:status=401", "s200 c1:401 t200 c2:401 t200 c3:401", NoRecord},
    {"UnauthorizedOnce", "coverage:status=401,count=1", "s200 c1:401 t200 c2:200", NewRecord},
    {"ServerError", "coverage:status=500", "s200 c1:500", NoRecord},
    {"NotFound", "coverage:status=404", "s200 c1:404", NoRecord},
    {"Redirect", "coverage:redirect", "s200 c1:302", NoRecord},
    {"NeverAnswers", "coverage:hang", "s200 c1:0", NoRecord, {.isLong = true}},
    {"Drips", "coverage:drip=50ms", "s200 c1:200", NoRecord, {.isLong = true}},
    {"ConnectionRefused", "", "s200", NoRecord, {.warrantyURL = refusing}},
    {"NoSuchHost", "", "s200", NoRecord, {.warrantyURL = nowhere}},
    {"UnknownCertificate", "", "s200", NoRecord, {.warrantyURL = untrusted}},
    {"DropsMidBody", "coverage:drop", "s200 c1:200", NoRecord},
    {"Garbage", "coverage:garbage", "s200 c1:200", NoRecord},
    {"Large", "coverage:large=100MiB", "s200 c1:200", NoRecord},
    {"Bomb", "coverage:bomb=1100MiB", "s200 c1:200", NoRecord},
    {"Nulls", "coverage:nulls", "s200 c1:200", RecordUnfiled},
    {"Resets", "coverage:reset", "s200 c1:0", NoRecord},
    {"Closes", "coverage:close", "s200 c1:0", NoRecord},
    {"NotHttp", "coverage:not-http", "s200 c1:0", NoRecord},
    {"Held", "coverage:hold", "s200 c1:0", NoRecord, {.isLong = true}},
    {"Delayed", "coverage:delay=50ms", "s200 c1:200", NewRecord},
    {"Deep", "coverage:deep", "s200 c1:200", NoRecord},
    {"TooShort", "coverage:length-long", "s200 c1:200", NoRecord},
    {"TooLong", "coverage:length-short", "s200 c1:200", NoRecord},
    {"LargeHeaders", "coverage:large-headers", "s200 c1:200", NoRecord},
    {"ManyReferences", "", "s200", NewRecord, {.warrantyURL = fromFile, .file = sharing<12'000, 650>}},
    {"TooManyReferences", "", "s200", NoRecord, {.warrantyURL = fromFile, .file = sharing<60'000, 6'000>}},
    {"ManyValues", "", "s200", NewRecord, {.warrantyURL = fromFile, .file = many}},
    {"DeepFile", "", "s200", NoRecord, {.warrantyURL = fromFile, .file = deep}},
    {"HugeFile", "", "s200", NoRecord, {.warrantyURL = fromFile, .file = huge}},

    {"VersionsTwiceAnArray", "server-version:array", "s200 s200! c1:200", NewRecord},
    {"OneVersion", "", "s200", NoRecord, {.document = R"({"highVersion": null})"}},
    {"VersionsAsStrings", "", "s200 c1:200", NewRecord, {.document = R"({"versionsAsStrings": true})"}},
    {"VersionsUnreachable", "", "c1:200", NewRecord, {.serverVersionURL = refusing}},
    {"VersionsOfManyTexts", "", "c1:200", NewRecord, {.serverVersionURL = fromFile, .file = sharing<60'000, 6'000>}},
    {"VersionsHuge", "server-version:large", "s200 c1:200", NewRecord},
    {"VersionsBomb", "server-version:bomb=1100MiB", "s200 c1:200", NewRecord},
    {"VersionsNeverAnswered", "server-version:hang", "s0 c1:200", NewRecord, {.isLong = true}},

    {"HelperMissing", "coverage:status=401,count=1", "s200 c1:401 c1:200", NewRecord, {.helper = ""}},
    {"HelperFails", "coverage:status=401,count=1", "s200 c1:401 c1:200", NewRecord, {.helper = "exit 1"}},
    {"HelperHangs", "coverage:status=401,count=1", "s200 c1:401 c1:200", NewRecord, {.helper = hangs, .isLong = true}},
    {"HelperBabbles", "coverage:status=401,count=1", "s200 c1:401 c1:200", NewRecord, {.helper = babbles}},
    {"HelperMissingWithoutToken", "", "s200", NoRecord, {.helper = "", .account = withoutToken}},
    {"HelperFailsWithoutToken", "", "s200", NoRecord, {.helper = "exit 1", .account = withoutToken}},
    {"HelperHangsWithoutToken", "", "s200", NoRecord, {.helper = hangs, .account = withoutToken, .isLong = true}},
    {"HelperBabblesWithoutToken", "", "s200", NoRecord, {.helper = babbles, .account = withoutToken}},
    {"NoAccount", "", "s200", NoRecord, {.account = ""}},
    {"NoAltDSID", "", "s200", NoRecord, {.account = withoutAltDSID}},
};

class NetworkFaults : public Network, public testing::WithParamInterface<Fault> {};

TEST_P(NetworkFaults, EndAsTheyShould) {
    const Fault& fault = GetParam();
    std::optional<CoverageServer> tls;
    if (fault.change.warrantyURL == untrusted) tls.emplace(place_.path(), Arguments{"--tls"});
    if (fault.change.file) place_.write("file", fault.change.file());
    auto url = [&](const char* meant) {
        return meant == fromFile ? "file://" + (place_ / "file") : tls ? tls->url() : meant;
    };
    if (fault.change.warrantyURL) setDefault("WarrantyURL", url(fault.change.warrantyURL));
    if (fault.change.serverVersionURL) setDefault("ServerVersionURL", url(fault.change.serverVersionURL));
    if (fault.change.document) server->ask("PATCH", "/document", fault.change.document);
    if (fault.change.helper) useHelper(fault.change.helper);
    if (fault.change.account) useAccount(fault.change.account);
    server->ask("POST", "/faults", fault.faults);
    if (fault.outcome == RecordUnfiled)
        for (std::string_view key : metadataKeys) setDefault(cacheMetadataKey(serialNumber, key), nullptr);
    const std::vector<Value> before = cached();
    resetPeakMemory();
    const long memoryBefore = peakMemory();

    auto reply = std::make_shared<std::promise<std::shared_ptr<VRXDeviceInfo>>>();  // which may be kept only once
    auto replied = reply->get_future();
    clients->getDefaultDeviceInfoUsingPolicy(
        VRXWarrantyLookupPolicyRefresh,
        [reply](client::Answer<std::shared_ptr<VRXDeviceInfo>> info) { reply->set_value(*info); });
    EXPECT_TRUE(*clients->getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicyCachedOnly));
    const bool isPending = replied.wait_for(0s) == std::future_status::timeout;
    EXPECT_TRUE(isPending || !fault.change.isLong) << "the other client had to wait";
    const auto record = replied.get()->warranty();

    EXPECT_TRUE(host::isSanitized || peakMemory() - memoryBefore < mostMemory) << peakMemory() - memoryBefore;
    EXPECT_EQ(server->requests(1 + std::ranges::count(std::string_view(fault.requests), ' ')), fault.requests);
    if (tls) {
        EXPECT_EQ(tls->ask("GET", "/counters")["handshakeFailures"], Value(1));
    }
    ASSERT_EQ(record != nullptr, fault.outcome != NoRecord);
    const std::vector<Value> after = cached();
    if (fault.outcome == NoRecord) {
        EXPECT_EQ(after, before);
        return;
    }
    EXPECT_EQ(after[0] == before[0], fault.outcome == RecordUnfiled);
    for (const Value& value : after) EXPECT_FALSE(value.isNull());
    EXPECT_NE(after[1], before[1]);
    if (fault.outcome == RecordUnfiled) return;
    EXPECT_EQ(record->dictionaryRepresentation()["round"], Value(2));
    const auto lookup = clients->getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicyCachedOnly);
    EXPECT_EQ((*lookup)->warranty()->dictionaryRepresentation(), record->dictionaryRepresentation());
}

INSTANTIATE_TEST_SUITE_P(Each, NetworkFaults, testing::ValuesIn(faults),
                         [](const auto& fault) { return std::string(fault.param.name); });

TEST_F(Network, DevicesAreRefreshedAtTheSameTimeOverFewConnections) {
    const auto infos = clients->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyRefresh, false);
    ASSERT_EQ(infos->size(), 3u);
    for (const auto& info : *infos) EXPECT_TRUE(info->warranty());
    const Value counters = server->ask("GET", "/counters");
    EXPECT_EQ(counters["requestsByEndpoint"], codec::parseJson(R"({"coverage": 3, "server-version": 3})").value());
    // One was there from before.
    EXPECT_LE(*counters["connections"].asInteger(), 2);
    EXPECT_GE(*counters["requestsOnReusedConnections"].asInteger(), 4);
}

TEST_F(Network, RequestsForOneDeviceAtTheSameTimeAreADownloadEach) {
    server->ask("POST", "/faults", "coverage:delay=200ms");
    std::array<std::promise<std::shared_ptr<VRXDeviceInfo>>, 2> replies;
    for (auto& reply : replies)
        clients->getDeviceInfoForSerialNumber(
            "VRXWATCH0001", VRXWarrantyLookupPolicyDefault,
            [&reply](client::Answer<std::shared_ptr<VRXDeviceInfo>> info) { reply.set_value(*info); });
    for (auto& reply : replies) EXPECT_TRUE(reply.get_future().get()->warranty());
    EXPECT_EQ(server->ask("GET", "/counters")["requestsByEndpoint"]["coverage"], Value(2));
}

}  // namespace
}  // namespace vrx::end_to_end
