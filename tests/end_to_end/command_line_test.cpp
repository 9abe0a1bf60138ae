// The discipline of vrxctl and vrxhost: exit codes, and with --json one document on standard output in every case.
#include <gtest/gtest.h>

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <filesystem>

#include "programs.h"

namespace vrx::end_to_end {
namespace {

using platform::Value;

// Runs without and with --json, and expects the code of both.
template <class Run>
Value expectCode(int code, const Arguments& arguments, Run run) {
    std::string words;
    for (const std::string& argument : arguments) words += argument + " ";
    SCOPED_TRACE(words);
    Arguments withJson = arguments;
    withJson.emplace_back("--json");
    const Place::Outcome plain = run(arguments);
    const Place::Outcome json = run(withJson);
    EXPECT_EQ(plain.code, code) << plain.errors;
    EXPECT_EQ(json.code, code) << json.errors;
    EXPECT_EQ(json.document["version"], Value(1)) << json.output;
    EXPECT_EQ(json.document["ok"], Value(code == 0)) << json.output;
    EXPECT_EQ(json.document["error"]["message"].isNull(), code == 0) << json.output;
    for (const std::string& errors : {plain.errors, json.errors}) EXPECT_EQ(errors.empty(), code == 0) << errors;
    return json.document;
}

const std::vector<Arguments> verbs{
    {"device"},   {"paired"}, {"info", "--policy", "cached"}, {"info", "X"}, {"all", "--policy", "1"}, {"dismiss", "X"},
    {"outreach"}, {"web-url"}};

class CommandLine : public testing::Test {
protected:
    Value expect(int code, const Arguments& arguments, const std::string& socket = "socket") {
        return expectCode(code, arguments, [&](const Arguments& all) { return place_.vrxctl(all, socket); });
    }
    Value expectHost(int code, const Arguments& arguments, const std::string& home = "home") {
        return expectCode(code, arguments, [&](const Arguments& all) { return place_.vrxhost(all, home); });
    }

    Place place_;
};

TEST_F(CommandLine, VerbsAnswer) {
    place_.start();
    ASSERT_TRUE(place_.isReady());
    place_.useCoverageFiles();

    EXPECT_EQ(expect(0, {"device"})["device"]["serialNumber"], Value("VRXPHONE0001"));
    EXPECT_EQ(expect(0, {"paired"})["devices"].asArray()->size(), 2u);
    EXPECT_EQ(expect(1, {"info", "--policy", "cached"})["device"]["name"], Value("Maya's Phone"));
    const Value info = expect(0, {"info", "VRXWATCH0001", "--timeout", "60"});
    EXPECT_EQ(info["coverage"]["coverageLocalizedLabel"], Value("QX Coverage for Watch"));
    EXPECT_EQ(info["derived"]["coverageEndDate"], Value("2031-03-14T00:00:00Z"));
    EXPECT_EQ(expect(0, {"all", "--update-follow-ups"})["devices"].asArray()->size(), 3u);
    EXPECT_TRUE(expect(0, {"web-url"})["webURL"].isNull());
    EXPECT_EQ(expect(0, {"dismiss", "VRXWATCH0001"})["serialNumber"], Value("VRXWATCH0001"));
    const Value dismissed = expectHost(0, {"defaults", "read", "FollowupDismissedSerialNumberHashes"})["value"];
    EXPECT_EQ(dismissed.asArray()->size(), 2u);  // asked for twice, with and without --json

    EXPECT_EQ(expectHost(0, {"defaults", "read", "WarrantyURL"})["registered"], Value(false));
    EXPECT_EQ(expectHost(0, {"defaults", "read", "OneDayInterval"})["registered"], Value(true));
    expectHost(0, {"defaults", "write", "K", "{\"a\": [1, 2.5]}"});
    EXPECT_EQ(expectHost(0, {"defaults", "read", "K"})["value"]["a"], Value(platform::Array{1, 2.5}));
    expectHost(0, {"defaults", "write", "K", "--int", "-5"});
    EXPECT_EQ(expectHost(0, {"defaults", "read", "K"})["value"], Value(-5));
    expectHost(0, {"defaults", "write", "K", "--date", "2026-01-31T12:00:00Z"});
    EXPECT_EQ(expectHost(0, {"defaults", "read", "K"})["type"], Value("date"));
    expectHost(0, {"defaults", "list"});
    expectHost(0, {"defaults", "delete", "K"});
    expectHost(1, {"defaults", "read", "K"});
    expectHost(0, {"defaults", "delete", "K"});
    EXPECT_EQ(expectHost(0, {"cache", "VRXWATCH0001"})["coverage"], info["coverage"]);
    expectHost(1, {"cache", "VRXWATCH0009"});
}

TEST_F(CommandLine, NoAgentIsNotReachable) {
    for (const Arguments& verb : verbs) EXPECT_EQ(expect(3, verb)["error"]["kind"], Value("not-reachable"));
    for (const Arguments& verb : {Arguments{"defaults", "list"},
                                  {"defaults", "write", "K", "1"},
                                  {"cache", "X"},
                                  {"followups", "--watch"},
                                  {"followups", "clear", "X"},
                                  {"activities"},
                                  {"fire", "outreach"},
                                  {"why", "X"},
                                  {"doctor", "--timeout", "0.1"}})
        expectHost(3, verb);
    EXPECT_FALSE(std::filesystem::exists(place_ / "home"));
}

TEST_F(CommandLine, HungAgentTimesOut) {
    const int hung = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    (place_ / "hung").copy(address.sun_path, sizeof address.sun_path - 1);
    ASSERT_EQ(bind(hung, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    ASSERT_EQ(listen(hung, 64), 0);
    for (Arguments verb : verbs) {
        verb.insert(verb.end(), {"--timeout", "0.2"});
        EXPECT_EQ(expect(5, verb, "hung")["error"]["kind"], Value("timed-out"));
    }
    // A terminal shows that it takes long, until it is over; a pipe holds nothing of it.
    const std::string slowly = place_ / "app/vrxctl" + " device --json --timeout 0.7 --socket " + place_ / "hung";
    const Place::Outcome terminal =
        place_.run("/usr/bin/script", {"-qec", slowly + " >" + place_ / "out", "/dev/null"});
    const std::string line = "waiting for the agent…";
    EXPECT_NE(terminal.output.find("\r" + line + "\r" + std::string(line.size(), ' ') + "\rvrxctl: "),
              std::string::npos)
        << terminal.output;
    EXPECT_TRUE(fileText(place_ / "out").starts_with("{"));
    EXPECT_EQ(place_.run("/bin/sh", {"-c", slowly}).errors.find(line), std::string::npos);
    close(hung);
}

TEST_F(CommandLine, ProgramWithoutEntitlementIsRefused) {
    place_.start();
    ASSERT_TRUE(place_.isReady());
    const auto expectRefused = [&](const std::string& program, const Arguments& verb) {
        const Value error = expectCode(4, verb, [&](Arguments all) {
            all.insert(all.begin(), {"--socket", place_ / "socket"});
            return place_.run(program, all);
        })["error"];
        EXPECT_EQ(error["kind"], Value("refused"));
        EXPECT_NE(error["message"].asString()->find("com.orvane.private.vrxagent"), std::string::npos);
        EXPECT_NE(error["message"].asString()->find(program), std::string::npos);
    };
    std::filesystem::create_directory(place_ / "elsewhere");
    std::filesystem::copy(place_ / "app/vrxctl", place_ / "elsewhere");
    for (const Arguments& verb : verbs) expectRefused(place_ / "elsewhere/vrxctl", verb);
    // A bundle that anyone could have written entitles to nothing.
    using std::filesystem::perms;
    permissions(std::filesystem::path(place_ / "app/bundle.toml"), perms::others_write,
                std::filesystem::perm_options::add);
    expectRefused(place_ / "app/vrxctl", {"device"});
}

TEST_F(CommandLine, UsageErrors) {
    for (const Arguments& arguments : {Arguments{},
                                       {"nothing"},
                                       {"device", "extra"},
                                       {"device", "--policy", "cached"},
                                       {"info", "A", "B"},
                                       {"info", "--policy", "fresh"},
                                       {"info", "--policy", "-1"},
                                       {"info", "--policy", "18446744073709551616"},
                                       {"all", "--timeout", "0"},
                                       {"all", "--timeout", "nan"},
                                       {"all", "--timeout", "1s"},
                                       {"all", "--bogus"},
                                       {"dismiss"}})
        EXPECT_EQ(expect(2, arguments)["error"]["kind"], Value("usage"));
    for (const Arguments& arguments : {Arguments{"defaults"},
                                       {"defaults", "read"},
                                       {"defaults", "write", "K"},
                                       {"defaults", "write", "K", "text"},
                                       {"defaults", "write", "K", "null"},
                                       {"defaults", "write", "K", "1", "--int", "2"},
                                       {"defaults", "write", "K", "--date", "today"},
                                       {"defaults", "list", "--device", "x"},
                                       {"followups", "clear"},
                                       {"followups", "post", "x", "--watch"},
                                       {"followups", "--device", "x", "clear", "y"},
                                       {"cache"},
                                       {"why"},
                                       {"fire"},
                                       {"activities", "x"},
                                       {"doctor", "--timeout", "0"}})
        EXPECT_EQ(expectHost(2, arguments)["error"]["kind"], Value("usage"));
    expect(0, {"--help"});
    expect(0, {"info", "--help"});
    expect(0, {"--version"});
}

TEST_F(CommandLine, TextOfARecordCannotSteerTheTerminal) {
    place_.start();
    ASSERT_TRUE(place_.isReady());
    place_.useCoverageFiles();
    place_.write("coverage/Warranty.VRXPHONE0001.plist",
                 "<plist version='1.0'><dict><key>coverageLocalizedLabel</key>"
                 "<string>one\ntwo&#x7f;&#x9b;2J&#x202e;</string></dict></plist>");
    const Place::Outcome outcome = place_.vrxctl({"info"});
    EXPECT_NE(outcome.output.find("one\\u{a}two\\u{7f}\\u{9b}2J\\u{202e}\n"), std::string::npos) << outcome.output;
}

}  // namespace
}  // namespace vrx::end_to_end
