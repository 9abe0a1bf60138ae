// What a request to the coverage server carries, and what becomes of it without account or token.
#include "vrx/coverage/account_headers.h"

#include "support/simulated_host.h"

namespace vrx {
namespace {

using platform::HttpRequest;

struct AccountHeadersTest : public OnSimulatedHost {
    AccountHeadersTest() { host.accounts.tokens[service] = "OLD"; }
    const std::string service = "com.orvane.ks.supportapp.auth";
};

TEST_F(AccountHeadersTest, NeedsAnAccountAndAToken) {
    // The lines of the log, and the token at the end when the request is signed.
    auto sign = [this](bool force) {
        host.log.clear();
        HttpRequest request;
        const bool isSigned = vrx_signWithAccountHeaders(request, force, false);
        EXPECT_EQ(request.headers.empty(), !isSigned);
        std::string text;
        for (const std::string& line : host.log.messages()) text += line + "\n";
        return isSigned ? text + request.headers["X-Orvane-KS-Token"] : text;
    };
    const std::string renewing = "Reprovision KS tokens\n", stored = "storeLocale 143441\n";
    const std::string lacking = "Failed to add KS headers, can't sign this request\n";
    const std::string failed =
        "No way to sign request with KS token because renewal of KS credential failed: 7, refused (account 7)\n";
    sim::AccountStore& accounts = host.accounts;
    accounts.mediaStorefront = "143441";
    accounts.renewedToken = "NEW";
    EXPECT_EQ(sign(false), stored + "OLD");
    EXPECT_EQ(sign(true), renewing + stored + "NEW");
    EXPECT_TRUE(!accounts.asked[0].avoidUI && accounts.asked[0].services == std::vector{service});
    accounts.tokens.clear();
    EXPECT_EQ(sign(false), renewing + stored + "NEW");
    accounts.renewalResult = {7, platform::Error{"account", 7, "refused"}};
    EXPECT_EQ(sign(true), renewing + failed + stored + "NEW");
    accounts.tokens.clear();
    const std::string noToken = "Error: still no KS token even after calling renewCredentialsForAccount.\n";
    EXPECT_EQ(sign(false), renewing + failed + noToken + lacking);
    accounts.authentication->altDSID.reset();
    EXPECT_EQ(sign(true), "Keystone signing failed because no there's no altDSID on the account.\n" + lacking);
    accounts.authentication.reset();
    EXPECT_EQ(sign(true), "Keystone signing failed because no KS account was provided.\n" + lacking);
    accounts.primary.reset();
    EXPECT_EQ(sign(true), "No primary Nimbus account, can't sign this request\n");
}

TEST_F(AccountHeadersTest, SignsWithWhatTheAccountGivesAndHidesItFromTheLog) {
    host.accounts.authentication->altDSID = "ALT-2";
    host.accountSession.headers = {{"Authorization", "SECRET"}, {"user-agent", "theirs"}};
    host.defaults.set("storefrontLocale", "tester's");
    HttpRequest request;
    vrx_signWithAccountHeaders(request, false, true);
    const std::string agent = "user-agent = <com.orvane.vrxagent/1.0/Simulated1,1>; X-Orvane-Client-Info = ";
    EXPECT_EQ(headerDescription(request).text,
              "{altDSID = ALT-1; Authorization = SECRET; storefrontLocale = tester's; " + agent +
                  "simulated; X-Orvane-Device-Id = SIM-DEVICE; X-Orvane-KS-Token = OLD;}");
    EXPECT_EQ(headerDescription(request).redacted,
              "{altDSID = ALT-1; Authorization = <private>; storefrontLocale = tester's; " + agent +
                  "<private>; X-Orvane-Device-Id = <private>; X-Orvane-KS-Token = <private>;}");
}

TEST_F(AccountHeadersTest, OfferRequestsNeedNoAccount) {
    HttpRequest first, second;
    host.device.contentSizeCategory = "XL";
    host.device.strings.erase("ProductVersion");
    host.accounts.primary.reset();
    host.accounts.mediaStorefront = "143441";
    first.headers["storefrontLocale"] = "an earlier one";
    vrx_addTarnHeadersWithOfferID(first, "O", "S");
    EXPECT_EQ(host.log.messages()[0], "Primary Nimbus Account is nil!");
    host.accounts.primary.emplace();
    vrx_addTarnHeadersWithOfferID(second, "O", "S");
    EXPECT_EQ(headerDescription(first).text,
              "{Offer-ID = O; User-Agent = <com.orvane.vrxagent/(null)/Simulated1,1>; X-Orvane-Content-Size = XL; "
              "X-Orvane-DM = No; X-Orvane-SN = S; X-Orvane-Txn-ID = 00000000-0000-4000-8000-000000000001;}");
    EXPECT_NE(first.headers["X-Orvane-Txn-ID"], second.headers["X-Orvane-Txn-ID"]);
    EXPECT_EQ(second.headers["storefrontLocale"], "143441");
    EXPECT_EQ(host.log.messages().back(), "storeLocale 143441");
}

TEST_F(AccountHeadersTest, TheBodyAsksForOneDeviceHereAndNow) {
    host.clock.set(dateFromEpoch(1735689600.9999));
    host.clock.setTimeZoneOffset(-std::chrono::minutes(9 * 60 + 30));
    HttpRequest request;
    vrx_setCoverageRequestBodyWithSerialNumber(request, "S\"1");
    EXPECT_EQ(request.method + headerDescription(request).text, "POST{Content-Type = application/json;}");
    EXPECT_EQ(bodyDescription(request),
              R"({"locale":"en_US","requestTimestamp":1735689600999,"requestTimezone":-9,"serialNumber":"S\"1"})");
    request.body.back() = 0xff;
    EXPECT_EQ(bodyDescription(request), std::nullopt);
    host.clock.set(dateFromEpoch(-1.5));
    vrx_setCoverageRequestBodyWithSerialNumber(request, "S");
    EXPECT_THAT(bodyDescription(request).value_or(""), HasSubstr(R"("requestTimestamp":0,)"));
    HttpRequest unwritable;
    vrx_setCoverageRequestBodyWithSerialNumber(unwritable, "\xff");
    EXPECT_TRUE(unwritable.body.empty());
}

}  // namespace
}  // namespace vrx
