// Downloads from a coverage file and from a server, what they leave in the cache, and the cache of records on disk with
// the move from the older single-device layout.
#include "vrx/coverage/warranty_downloader.h"

#include "support/simulated_host.h"
#include "vrx/coverage/account_headers.h"
#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"

namespace vrx {
namespace {

class WarrantyDownloaderTest : public OnSimulatedHost {
protected:
    WarrantyDownloaderTest() {
        host.defaults.registerDefaults({{"LowServerVersion", 2}, {"HighServerVersion", 3}});
        host.defaults.set("WarrantyURL", "file:///data/Warranty.plist");
        putRecord("/data/Warranty.plist", Dictionary{{"covered", true}});
    }
    void putRecord(const std::string& path, const Value& record) { host.files.put(path, propertyList(record)); }
    std::shared_ptr<VRXWarranty> download(const std::optional<std::string>& serialNumber) {
        auto downloader = VRXWarrantyDownloader::initWithCallingProcessBundleID("com.orvane.Preferences");
        return replyOf<std::shared_ptr<VRXWarranty>>([&](auto reply) {
            downloader->downloadWarrantyForSerialNumber(
                serialNumber, [reply](bool success, const std::shared_ptr<VRXWarranty>& warranty) {
                    EXPECT_EQ(success, warranty != nullptr);
                    reply(warranty);
                });
        });
    }
    // Says so in the log, and leaves cache and metadata as they were.
    void expectFailure(const std::string& line) {
        const auto cached = VRXWarranty::cachedWarrantyForSerialNumber("S");
        const Value date = metadata(cachedWarrantyLastUpdatedDateKey);
        host.log.clear();
        EXPECT_FALSE(download("S"));
        EXPECT_THAT(host.log.messages(), testing::Contains(line));
        EXPECT_EQ(host.log.messages().back(), "vrxagent failed to load warranty");
        EXPECT_TRUE(VRXWarranty::cachedWarrantyForSerialNumber("S")->isEqual(cached.get()));
        EXPECT_EQ(metadata(cachedWarrantyLastUpdatedDateKey), date);
    }
    Value metadata(std::string_view key) { return host.defaults.get(cacheMetadataKey("S", key)); }
};

TEST_F(WarrantyDownloaderTest, StoresTheRecordWithItsMetadata) {
    const auto warranty = download("S");
    ASSERT_TRUE(warranty && warranty->covered());
    EXPECT_TRUE(VRXWarranty::cachedWarrantyForSerialNumber("S")->isEqual(warranty.get()));
    EXPECT_TRUE(metadata(cachedWarrantyLastUpdatedDateKey).asDate());
    EXPECT_EQ(metadata(cachedWarrantyLocaleKey), Value(host.locale.preferredLocaleIdentifier()));
    EXPECT_EQ(metadata(cachedWarrantyVersionKey), Value("2"));
    EXPECT_EQ(host.log.lastMessage("caching warranty for locale: '%@', version: %@"),
              "caching warranty for locale: 'en_US', version: 2");
}

TEST_F(WarrantyDownloaderTest, PrefersTheSerialNumbersOwnFile) {
    putRecord("/data/Warranty.plist", Dictionary{{"which", "common"}});
    putRecord("/data/Warranty.S.plist", Dictionary{{"which", "own"}});
    putRecord("/secret.plist", Dictionary{{"which", "stolen"}});
    auto which = [this](const char* serialNumber) {
        return download(serialNumber)->dictionaryRepresentation()["which"];
    };
    EXPECT_EQ(which("S"), Value("own"));
    EXPECT_EQ(which("T"), Value("common"));
    EXPECT_EQ(which("/../../secret"), Value("common"));
    host.files.put("/data/Warranty.S.plist", "");
    EXPECT_EQ(which("S"), Value("common"));
}

TEST_F(WarrantyDownloaderTest, AFailureLeavesTheCacheAsItWas) {
    EXPECT_TRUE(download("S"));
    const std::string url = "file:///data/Warranty.plist";
    host.files.put("/data/Warranty.plist", "garbage");
    expectFailure("loading warranty from: " + url);
    EXPECT_TRUE(host.log.contains("Error serializing plist file from URL '%@': %@"));
    putRecord("/data/Warranty.plist", Array{1});
    expectFailure("loading warranty from: " + url);
    host.files.remove("/data/Warranty.plist");
    expectFailure("URL '" + url + "' contains no plist data");
    host.defaults.set("WarrantyURL", "no url");
    expectFailure("vrxagent failed to load warranty");
    EXPECT_FALSE(download(std::nullopt));
}

TEST_F(WarrantyDownloaderTest, AServerOfOtherVersionsIsNotAsked) {
    Dictionary versions{{"LowServerVersion", 8}, {"HighServerVersion", 9}};
    host.defaults.set("ServerVersionURL", "file:///data/versions.plist");
    putRecord("/data/versions.plist", versions);
    EXPECT_FALSE(download("S"));
    EXPECT_TRUE(host.log.contains("Warranty download skipped server due to server version"));
    EXPECT_FALSE(host.log.contains("vrxagent failed to load warranty"));

    // A cache from before is not believed: each download negotiates afresh, here with a server that is away.
    host.files.remove("/data/versions.plist");
    EXPECT_TRUE(download("S"));
}

struct ServerTest : WarrantyDownloaderTest {
    ServerTest() {
        host.defaults.set("WarrantyURL", url);
        host.http.answer(url, sim::HttpAnswer::ok(R"({"old": 1})"));
        host.accounts.tokens[service] = "T0";
        host.accounts.renewedToken = "T1";
    }
    std::string sentTokens() const {
        std::string tokens;
        for (const auto& sent : host.http.sentTo(url)) tokens += sent.request.headers.at("X-Orvane-KS-Token");
        return tokens;
    }
    const char* const url = "https://coverage.example/summary";
    const char* const service = "com.orvane.ks.supportapp.auth";
};

TEST_F(ServerTest, FailsForEveryAnswerButAnObject) {
    using sim::HttpAnswer;
    ASSERT_TRUE(download("S"));
    const HttpAnswer refusal = HttpAnswer::status(401, R"({"why": "token"})");
    const std::pair<std::vector<HttpAnswer>, std::string> cases[] = {
        {{refusal, refusal, refusal}, "401 : {why = token;}"},
        {{refusal, HttpAnswer::status(500)}, "500 : invalid JSON at byte 0: unexpected end of input (json 74)"},
        {{HttpAnswer::status(404, "{}")}, "404 : {}"},
        {{HttpAnswer::status(201, "{}")}, "201 : {}"},
        {{HttpAnswer::failure()}, "0 : connection lost (http 1)"},
        {{HttpAnswer::ok("[1]")}, "200 : (1)"},
        {{HttpAnswer::ok("null")}, "200 : (null)"},
    };
    std::size_t requests = 1;
    for (const auto& [answers, lastStatus] : cases) {
        SCOPED_TRACE(lastStatus);
        for (const HttpAnswer& answer : answers) host.http.answerOnce(url, answer);
        expectFailure("load warranty status: " + lastStatus);
        requests += answers.size();
        EXPECT_EQ(host.http.sentTo(url).size(), requests);
        EXPECT_EQ(host.log.count("Reprovision KS tokens"), static_cast<int>(answers.size()) - 1);
    }
}

TEST_F(ServerTest, RenewsARefusedTokenAndTriesAgain) {
    for (int i = 0; i < 2; ++i) host.http.answerOnce(url, sim::HttpAnswer::status(401));
    host.http.answerOnce(url, sim::HttpAnswer::ok(R"({"n": null})"));  // which no file can hold
    EXPECT_TRUE(download("S"));
    EXPECT_FALSE(VRXWarranty::cachedWarrantyForSerialNumber("S"));
    EXPECT_EQ(metadata(cachedWarrantyVersionKey), Value("2"));
    EXPECT_EQ(sentTokens(), "T0T1T1");
    EXPECT_TRUE(host.accounts.asked[0].avoidUI);
    const platform::HttpRequest last = host.http.sentTo(url)[2].request;
    EXPECT_EQ(last.sourceApplication, "com.orvane.Preferences");
    EXPECT_THAT(last.method + bodyDescription(last).value_or(""),
                AllOf(HasSubstr("POST"), HasSubstr(R"("serialNumber":"S")")));

    std::string formats;
    for (const auto& entry : host.log.entries()) formats.append(entry.format).append("|");
    const std::string attempt = "%{private}@ : warranty download attempt (%d/%d)|";
    const std::string rest = "storeLocale %@|Retrying request:|Headers: %@|Body: %@|load warranty status: %ld : %@|";
    const std::string retry = attempt + "Reprovision KS tokens|" + rest;
    EXPECT_THAT(formats, HasSubstr("|" + attempt + rest + retry + retry + "downloaded warranty: %@|"));
    EXPECT_EQ(host.log.lastMessage("%{private}@ : warranty download attempt (%d/%d)"),
              "S : warranty download attempt (2/2)");
}

TEST_F(ServerTest, SilentServersAreGivenUpInTime) {
    host.defaults.set("ServerVersionURL", "https://cdn.example/versions");
    host.http.answer("https://cdn.example/versions", sim::HttpAnswer::silence());
    host.http.answer(url, sim::HttpAnswer::silence());
    EXPECT_FALSE(download("S"));
    EXPECT_EQ(timeToReply, Duration(60 + 30));
}

TEST_F(ServerTest, AnHourOfRenewalHoldsUpNothingElse) {
    host.defaults.set("ServerVersionOverride", Dictionary{{"LowServerVersion", 2}, {"HighServerVersion", 3}});
    host.accounts.tokens.clear();
    host.accounts.renewalDelay = std::chrono::hours(1);
    int successes = 0;
    VRXWarrantyDownloader::initWithCallingProcessBundleID("com.orvane.Preferences")
        ->downloadWarrantyForSerialNumber("S", [&](bool success, auto) { successes += success; });
    EXPECT_TRUE(host.accounts.asked.empty()) << "the caller would have waited";
    host.run();
    host.accounts.tokens[service] = "T0";
    EXPECT_TRUE(download("T"));
    EXPECT_EQ(successes, 0);
    host.runFor(std::chrono::hours(1));
    EXPECT_EQ(successes, 1);
    EXPECT_EQ(sentTokens(), "T0T1");
}

class WarrantyCacheTest : public OnSimulatedHost {
protected:
    std::string pathOf(const std::string& serialNumber) const {
        return host.files.homeDirectory() + "/Library/Application Support/com.orvane.Vireo/" +
               platform::sha256Hash(serialNumber) + "_Warranty.plist";
    }
    static std::shared_ptr<VRXWarranty> record(Dictionary dictionary) {
        return VRXWarranty::warrantyWithDictionary(std::move(dictionary));
    }
};

TEST_F(WarrantyCacheTest, KeepsOneFileForEachSerialNumber) {
    record({{"covered", true}})->cacheWarranty("A");
    auto second = record({{"covered", false}, {"text", std::string("nul \0 inside", 12)}});
    second->cacheWarranty("A");
    EXPECT_EQ(host.files.paths(), std::vector{pathOf("A")});
    auto cached = VRXWarranty::cachedWarrantyForSerialNumber("A");
    ASSERT_TRUE(cached);
    EXPECT_TRUE(cached->isEqual(second.get()));
    EXPECT_FALSE(VRXWarranty::cachedWarrantyForSerialNumber("B"));
    EXPECT_FALSE(VRXWarranty::cachedWarrantyForSerialNumber(std::nullopt));

    second->cache();
    EXPECT_TRUE(VRXWarranty::cachedWarrantyForSerialNumber(std::nullopt));
    EXPECT_EQ(host.files.paths().size(), 2u);
}

TEST_F(WarrantyCacheTest, MigratesTheOlderLayout) {
    EXPECT_FALSE(VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber("A"));
    EXPECT_FALSE(host.log.contains("Migrating legacy warranty.."));

    auto legacy = record({{"covered", true}});
    legacy->cache();
    host.defaults.set("CachedWarrantyLastUpdatedDate", dateFromEpoch(1700000000));
    host.defaults.set("CachedWarrantyLocale", "en_US");
    EXPECT_FALSE(VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber(std::nullopt));

    auto moved = VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber("A");
    ASSERT_TRUE(moved);
    EXPECT_TRUE(moved->isEqual(legacy.get()));
    EXPECT_EQ(host.files.paths(), std::vector{pathOf("A")});
    EXPECT_EQ(host.defaults.dictionaryRepresentation(),
              (Dictionary{{cacheMetadataKey("A", cachedWarrantyLastUpdatedDateKey), dateFromEpoch(1700000000)},
                          {cacheMetadataKey("A", cachedWarrantyLocaleKey), "en_US"}}));
}

}  // namespace
}  // namespace vrx
