// What vrx-coverage-server check says of a server, which is the development server with its faults.
#include "end_to_end/coverage_server.h"
#include "vrx/codec/json.h"

namespace vrx::end_to_end {
namespace {

using namespace ::testing;

constexpr const char* secretToken = "token-of-the-account";

// What is wrong, as far as it is more than good: "name" for a problem, "name~" for a note, in the order of the answer.
struct CheckedServer {
    const char* faults;
    int code;
    std::vector<std::string> wrong;
    const char* said = "";      // in the text
    Arguments options{};        // in place of the version document's address
    const char* document = "";  // settings of the version document
};

const CheckedServer checkedServers[] = {
    {"", 0, {"dates~"}, "shown from"},
    {"coverage:status=401,count=2", 0, {"coverage~", "dates~"}, "refused 2 times"},
    {"coverage:status=401", 4, {"coverage"}, "refused 3 times"},
    {"coverage:status=500", 1, {"coverage"}, "status 500"},
    {"coverage:redirect", 1, {"coverage"}, "redirect"},
    {"coverage:array", 1, {"coverage"}, "a list, which is no record"},
    {"coverage:not-json", 1, {"coverage"}, "JSON"},
    {"coverage:drop", 1, {"coverage"}, "broke off"},
    {"coverage:large=5MiB", 1, {"coverage"}, "too large"},
    {"coverage:close", 3, {"coverage"}},
    {"coverage:hang", 5, {"coverage"}, "in time", {"--timeout", "0.5"}},
    {"coverage:nulls=kelURL", 1, {"disk", "kelURL~", "dates~"}, "cannot be kept"},

    {R"(coverage:body={"covered": [], "coverageEndDate": "soon", "qxOfferDisplayDate": -5, "kelURL": 7, "more": 1,
        "qxOfferEligibleUntil": 17000000000, "qxOfferFollowupDisplayDate": 5000000000, "isQxSubscription": "on",
        "qxLogoToggle": "00n", "isQxServicesPartner": "yes", "qxOfferBadgeBeforeEndDate": "week",
        "qxLocalizedOfferPluralDescFormat": "soon", "featureToggleParameters": 1, "coverage": {"benefitsCard": "x",
        "note": 1}})",
     1,
     {"featureToggleParameters", "covered", "coverageEndDate", "qxOfferEligibleUntil", "qxOfferFollowupDisplayDate",
      "qxOfferDisplayDate", "qxLocalizedOfferPluralDescFormat~", "qxOfferBadgeBeforeEndDate~", "isQxSubscription~",
      "coverage.benefitsCard", "kelURL", "other keys~"},
     "handed on, but not read: more, coverage.note"},
    {R"(coverage:body={"qxOfferEligible": true, "featureToggleParameters": {"qxOfferDisplay": 0}})",
     0,
     {"offer~"},
     "never shown: featureToggleParameters.qxOfferDisplay"},
    {R"(coverage:body={"featureToggleParameters": {"qxOfferDisplay": 1}})", 1, {"offer"}, "qxOfferEligibleUntil"},
    {R"(coverage:body={"featureToggleParameters": {"qxOfferDisplay": 1}, "qxOfferEligibleUntil": 1700000000})",
     0,
     {"offer~"},
     "ended at 2023-11-14"},
    {R"(coverage:body={"featureToggleParameters": {"qxOfferDisplay": 1}, "qxOfferEligibleUntil": 4000000000,
        "qxOfferFollowupDisplayDate": 4000000000})",
     1,
     {"offer"},
     "never shown: it is due"},
    {R"(coverage:body={"featureToggleParameters": {"qxOfferDisplay": 1, "qxOfferDurationDaysBeforeEndDate": 1},
        "qxOfferEligibleUntil": 4000000000})",
     0,
     {"offer~"},
     "without a text for qxLocalizedOfferLabel"},

    {"server-version:status=404", 1, {"server version", "server version cache~", "dates~"}, "answers with 404"},
    {"server-version:array", 1, {"server version", "dates~"}, "Incorrect format"},
    {"server-version:close", 3, {"server version", "dates~"}},
    {"", 1, {"server version", "dates~"}, "missing key 'HighServerVersion'", {}, R"({"highVersion": null})"},
    {"", 1, {"server version", "dates~"}, "none is shared", {}, R"({"lowVersion": 7, "highVersion": 8})"},
    {"", 0, {"server version~", "dates~"}, "watches", {}, R"({"lowVersion": 1, "highVersion": 2})"},
    {"", 0, {"server version cache~", "dates~"}, "asked for before each", {}, R"({"cacheControl": "no-store"})"},
    {"", 0, {"dates~"}, "skipped", {"--token", secretToken}},
    {"", 2, {}, "", {"--timeout", "0"}},
};

TEST_F(AtPlace, ChecksAServerAsTheAgentReadsIt) {
    setenv("no_proxy", "*", 1);
    const CoverageServer server(place_.path(), {"--quiet", "--records", VRX_SOURCE "/examples/records", "--token",
                                                secretToken, "--token", "development-token"});
    const std::string program = VRX_PROGRAMS "/vrx-coverage-server", url = server.url() + "/api/v2/coverage/summary";
    const Arguments versions{"--server-version", server.url() + "/library/ORVANE/asset/vrxV2.plist"};
    const Value usual = server.ask("GET", "/document");
    for (const CheckedServer& wanted : checkedServers) {
        std::string faults = wanted.faults;
        std::erase(faults, '\n');  // each line would be one
        SCOPED_TRACE(faults + " " + wanted.document);
        if (*wanted.document) server.ask("PATCH", "/document", wanted.document);
        Arguments options = wanted.options.empty() ? versions : wanted.options;
        options.insert(options.begin(), {"check", url});
        server.ask("POST", "/faults", faults);
        const Place::Outcome text = place_.run(program, options);
        server.ask("DELETE", "/faults");
        server.ask("POST", "/faults", faults);
        const Place::Outcome json = place_.run(program, options, {"--json"});
        server.ask("DELETE", "/faults");
        if (*wanted.document) server.ask("PATCH", "/document", codec::printedJson(usual, codec::JsonLayout::OneLine));

        EXPECT_EQ(text.code, wanted.code) << text.errors;
        EXPECT_EQ(json.code, wanted.code) << json.errors;
        EXPECT_THAT(text.output + text.errors, AllOf(HasSubstr(wanted.said), Not(HasSubstr(secretToken))));
        std::vector<std::string> wrong;
        if (const Array* checks = json.document["checks"].asArray())
            for (const Value& check : *checks)
                if (check["health"] == Value("problem") || check["health"] == Value("note"))
                    wrong.push_back(*check["name"].asString() + (check["health"] == Value("note") ? "~" : ""));
        EXPECT_EQ(wrong, wanted.wrong) << text.output;
    }
    EXPECT_EQ(place_.run(program, {"--quiet", "check", url}).code, 2);
}

TEST_F(AtPlace, ChecksWithTheDevicesProfileAndFromFiles) {
    setenv("no_proxy", "*", 1);
    const CoverageServer server(place_.path(), {"--tls", "--tls-certificate", place_ / "ca.pem"});
    place_.write("helper", "#!/bin/sh\necho token=development-token; echo \"$0\" >&2\n");
    place_.setMode("helper", 0700);
    place_.write("account.toml",
                 "[account]\nidentifier = 'ada'\nalt_dsid = '1'\ncredential_helper = ['" + place_ / "helper" + "']\n");
    const std::string program = VRX_PROGRAMS "/vrx-coverage-server", url = server.url() + "/api/v2/coverage/summary";
    const Arguments asked{"check", url, "--device", place_ / "account.toml", "--json"};
    EXPECT_EQ(place_.run(program, asked).code, 3) << "a certificate that nobody trusts";
    const Place::Outcome trusting = place_.run(program, asked, {"--ca-file", place_ / "ca.pem"});
    EXPECT_EQ(trusting.code, 0) << trusting.errors;
    const Value read = codec::parseJson(R"([{"key": "covered", "kind": "flag", "sent": true, "read": true}])").value();
    EXPECT_EQ(trusting.document["keys"], read);

    place_.write("account.toml", "");
    EXPECT_THAT(place_.run(program, asked).errors, HasSubstr("not asked"));
    const Place::Outcome files =
        place_.run(program, {"check", "file://" + place_ / "coverage/Warranty.plist", "--server-version",
                             "file://" + place_ / "coverage/ServerVersion.plist"});
    EXPECT_EQ(files.code, 0) << files.errors;
    EXPECT_THAT(files.output, HasSubstr("shared with the agent"));
    EXPECT_EQ(place_.run(program, {"check", "file://" + place_ / "none.plist"}).code, 1);
    const Place::Outcome plain = place_.run(program, {"check", "http://coverage.invalid/"});
    EXPECT_EQ(plain.code, 3);
    EXPECT_THAT(plain.errors, HasSubstr("plain http is for this machine only"));
}

}  // namespace
}  // namespace vrx::end_to_end
