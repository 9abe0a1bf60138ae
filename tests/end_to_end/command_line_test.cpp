// Every verb of vrxctl and vrxhost, whatever has become of the agent: exit codes, one document with --json in every
// case, and on standard error the cause of a failure and what to try next.
#include <sys/file.h>

#include <algorithm>
#include <csignal>
#include <map>
#include <sstream>

#include "end_to_end/programs.h"
#include "host/http/loopback_server.h"
#include "vrx/host/home/database.h"
#include "vrx/host/home/home_lock.h"
#include "vrx/host/ipc/listening_socket.h"

namespace vrx::end_to_end {
namespace {

struct Verb {
    const char* words;
    const char* member;  // of the document, when there is an agent
    int up = 0;
    int hung = 5;
};

const std::vector<Verb> vrxctlVerbs{{"status", "devices"},
                                    {"device", "device"},
                                    {"paired", "devices"},
                                    {"info", "coverage"},
                                    {"info X --policy cached", "device", 1},
                                    {"all --update-follow-ups", "devices"},
                                    {"dismiss VRXWATCH0001", "serialNumber"},
                                    {"dismiss X --force", "serialNumber"},
                                    {"outreach", "scheduled"},
                                    {"store com.example", "availability", 1},
                                    {"support com.example", "availability", 1},
                                    {"web-url", "webURL"}};
// Hung is who holds the database: those that only look at it do not mind.
const std::vector<Verb> vrxhostVerbs{{"why VRXWATCH0001", "rule", 0, 0},
                                     {"doctor --timeout 4", "checks"},
                                     {"activities", "activities", 0, 0},
                                     {"fire followuprefresh", "fired"},
                                     {"followups", "followUps", 0, 0},
                                     {"followups --watch", "followUps"},
                                     {"followups post item.json", "replaced"},
                                     {"followups clear a", "cleared"},
                                     {"undismiss VRXWATCH0001", "undismissed", 0, 0},
                                     {"cache X", "path", 1, 1},
                                     {"defaults list", "defaults", 0, 0},
                                     {"defaults read OneDayInterval", "value", 0, 0},
                                     {"defaults read K", "error", 1, 1},
                                     {"defaults write PostUpgradeOutreachDelay 172800", "value"},
                                     {"defaults delete L", "deleted"}};

using Texts = std::vector<std::string>;

// What a command comes to, and what it must say of a failure.
struct Case {
    Arguments command;
    int code;
    Texts named{};
    std::string member{};
};

class CommandLine : public AtPlace {
protected:
    CommandLine() {
        place_.write("item.json", R"({"uniqueIdentifier": "b"})");
        place_.write("pending.json", R"({"uniqueIdentifier": "a"})");
    }

    Arguments command(Arguments program, const std::string& words) const {
        std::istringstream stream(words);
        for (std::string word; stream >> word;) program.push_back(word.ends_with(".json") ? place_ / word : word);
        if (words.starts_with("doctor"))
            program.insert(program.end(), {"--socket", place_ / "socket", "--device", place_ / "device.toml"});
        return program;
    }
    // All at the same time, each without and with --json.
    void expect(const std::vector<Case>& cases) const {
        std::vector<Arguments> commands;
        for (const Case& one : cases) {
            commands.insert(commands.end(), 2, one.command);
            // Of one activity, the second run would be refused while the first is under way.
            if (!one.code) std::ranges::replace(commands.back(), "followuprefresh", "followuppost");
            commands.back().emplace_back("--json");
        }
        const std::vector<Place::Outcome> outcomes = place_.runAll(commands);
        for (std::size_t i = 0; i < cases.size(); ++i) expectForms(cases[i], outcomes[2 * i], outcomes[2 * i + 1]);
    }
    static void expectForms(const Case& one, const Place::Outcome& plain, const Place::Outcome& json) {
        SCOPED_TRACE(testing::PrintToString(one.command) + "\n" + plain.errors + json.output);
        const bool isDone = one.code == 0;
        EXPECT_EQ(plain.code, one.code);
        EXPECT_EQ(json.code, one.code);
        ASSERT_TRUE(json.document.asDictionary()) << "one document";
        EXPECT_EQ(json.document["version"], Value(1));
        EXPECT_EQ(json.document["ok"], Value(isDone));
        EXPECT_TRUE(one.member.empty() || json.document.asDictionary()->contains(one.member));
        EXPECT_EQ(plain.errors.empty() && json.errors.empty(), isDone);
        const Value error = json.document["error"];
        ASSERT_EQ(error.isNull(), isDone);
        if (isDone) return;
        const bool isDoctor = std::ranges::find(one.command, "doctor") != one.command.end();
        EXPECT_TRUE(plain.output.empty() || one.code == 1 || isDoctor) << "more than is known";
        for (const auto& [code, kind] : {std::pair(2, "usage"), {3, "not-reachable"}, {5, "timed-out"}})
            EXPECT_EQ(error["kind"] == Value(kind), one.code == code);
        const std::string message = *error["message"].asString(), advice = *error["advice"].asString();
        EXPECT_FALSE(message.empty() || advice.empty());
        const bool isVrxctl = one.command.front().ends_with("vrxctl");
        const std::string told = (isVrxctl ? "vrxctl: " : "vrxhost: ") + message + "\n" + advice + "\n";
        for (const auto* outcome : {&plain, &json}) EXPECT_TRUE(outcome->errors.ends_with(told));
        for (const std::string& name : one.named) EXPECT_NE(told.find(name), told.npos) << name;
    }
    void expectAll(const Arguments& program, const std::vector<Verb>& verbs, int code, const Texts& named) const {
        std::vector<Case> cases;
        for (const Verb& verb : verbs) cases.push_back({command(program, verb.words), code, named});
        expect(cases);
    }
    Value value(const Arguments& program, const std::string& words) const {
        return place_.runAll({command(program, words + " --json")}).front().document;
    }

    const Arguments vrxctl_{place_ / "app/vrxctl", "--socket", place_ / "socket"};
    const Arguments vrxhost_{place_ / "app/vrxhost", "--home", place_ / "home"};
};

TEST_F(CommandLine, Answers) {
    start();
    std::vector<Case> fire, asking, looking{{command(vrxhost_, "fire x"), 4, {"no activity", "vrxhost activities"}}};
    for (const Verb& verb : vrxhostVerbs)
        if (!std::string_view(verb.words).ends_with("--watch"))
            (std::string_view(verb.words).starts_with("fire") ? fire : looking)
                .push_back({command(vrxhost_, verb.words), verb.up, {}, verb.member});
    for (const Verb& verb : vrxctlVerbs) asking.push_back({command(vrxctl_, verb.words), verb.up, {}, verb.member});
    asking.push_back({command(vrxctl_, "info " + std::string(1025, 'x')), 4, {"1024", "Correct the argument"}});
    asking.push_back(
        {command(vrxctl_, "info X --policy cached"), 1, {"knows no device with the serial number X", "vrxctl all"}});
    asking.push_back({command(vrxctl_, "dismiss Y"), 4, {"knows no device with the serial number Y", "--force"}});
    for (const auto& cases : {fire, asking, looking}) expect(cases);

    // What the table leaves open.
    EXPECT_EQ(value(vrxctl_, "device")["device"]["name"], Value("Maya's Phone"));
    EXPECT_EQ(value(vrxctl_, "info X --policy cached")["device"]["name"], Value("<unknown>"));
    EXPECT_EQ(value(vrxctl_, "support com.example")["availability"], Value(Dictionary{{"AppBundleID", "com.example"}}));
    EXPECT_EQ(value(vrxctl_, "paired")["devices"].asArray()->size(), 2u);
    EXPECT_EQ(value(vrxctl_, "all")["devices"].asArray()->size(), 3u);
    EXPECT_EQ(value(vrxhost_, "defaults read FollowupDismissedSerialNumberHashes")["value"].asArray()->size(), 2u)
        << "X, twice";
    for (const bool wasDismissed : {true, false})
        EXPECT_EQ(value(vrxhost_, "undismiss X")["undismissed"], Value(wasDismissed));
    const Value info = value(vrxctl_, "info VRXWATCH0001 --policy cached --timeout 60");
    EXPECT_EQ(info["coverage"]["coverageLocalizedLabel"], Value("QX Coverage for Watch"));
    EXPECT_EQ(info["derived"]["coverageEndDate"], Value("2031-03-14T00:00:00Z"));
    const Value cached = value(vrxhost_, "cache VRXWATCH0001");
    EXPECT_EQ(cached["coverage"], info["coverage"]);
    EXPECT_EQ(value(vrxhost_, "defaults read OneDayInterval")["registered"], Value(true));
    for (const auto& [form, stored, type] :
         {std::tuple(R"({"a":[1,2.5]})", Value(Dictionary{{"a", Array{1, 2.5}}}), "dictionary"),
          {"--int -5", Value(-5), "integer"},
          {"--date 2026-01-31T12:00:00Z", Value("2026-01-31T12:00:00Z"), "date"}}) {
        EXPECT_EQ(value(vrxhost_, std::string("defaults write K ") + form)["ok"], Value(true));
        const Value setting = value(vrxhost_, "defaults read K");
        EXPECT_EQ(setting["value"], stored);
        EXPECT_EQ(setting["type"], Value(type));
        EXPECT_EQ(setting["registered"], Value(false));
    }
    EXPECT_EQ(value(vrxhost_, "defaults delete K")["deleted"], Value(true));
    for (const auto& [words, warning] :
         {std::pair("SerialNumber 5",
                    "vrxhost: the agent ignores a value of this type, integer: SerialNumber is a string"),
          {"OneDayInterval --string soon",
           "vrxhost: the agent ignores a value of this type, string: OneDayInterval is a number"},
          {"OneDayInterval --string 86400", ""},
          {"VRXWATCH0001.activationInterval -60", ""},
          {".activationInterval -60", "vrxhost: no part of the agent reads .activationInterval"},
          {"AppSupportAvailability --string NO", ""}}) {
        const Place::Outcome written =
            place_.runAll({command(vrxhost_, std::string("defaults write ") + words)}).front();
        EXPECT_EQ(written.code, 0) << words;
        EXPECT_EQ(written.errors, warning + std::string(*warning ? "\n" : "")) << words;
    }
    EXPECT_EQ(value(vrxhost_, "defaults read SerialNumber")["value"], Value(5)) << "written all the same";

    // A report is one file, once, and tells of nobody.
    Arguments report = command(vrxhost_, "report");
    report.push_back(place_ / "report");
    EXPECT_EQ(place_.runAll({report}).front().code, 0);
    EXPECT_EQ(place_.runAll({report}).front().code, 1) << "it is there already";
    const std::string reported = fileText(place_ / "report");
    for (const char* part : {"== doctor\n", "== activities\n", "vrxagent.outreach", "== profile\n", "== log"})
        EXPECT_NE(reported.find(part), reported.npos) << part;
    for (const char* secret : {"VRXPHONE", "VRXWATCH", "Maya's", "maya@", "2f3a7c1e"})
        EXPECT_EQ(reported.find(secret), reported.npos) << secret;

    // Days are the agent's, and this device comes first.
    EXPECT_EQ(value(vrxhost_, "defaults write OneDayInterval 1e12")["ok"], Value(true));
    const Value all = value(vrxctl_, "all --policy cached"), status = value(vrxctl_, "status");
    EXPECT_EQ(status["devices"], all["devices"]);
    EXPECT_EQ(status["agent"]["account"], Value(true));
    EXPECT_EQ(status["problems"], Value(Array{}));
    EXPECT_EQ(status["followUps"].asArray()->front()["identifier"], Value("b")) << "posted above";
    EXPECT_EQ(all["devices"].asArray()->front()["device"]["deviceTypeString"], Value("Default"));
    EXPECT_EQ(all["devices"].asArray()->back()["derived"]["daysEligible"], Value(1));

    // Text of a record cannot steer the terminal.
    place_.write("coverage/Warranty.VRXPHONE0001.plist",
                 "<plist version='1.0'><dict><key>coverageLocalizedLabel</key>"
                 "<string>one\ntwo&#x7f;&#x9b;2J&#x202e;</string></dict></plist>");
    const std::string shown = place_.vrxctl({"info", "--policy", "refresh"}).output;
    // A refresh that leaves a device without a record has failed.
    expect({{command(vrxctl_, "all --policy refresh"), 0}});
    place_.write("coverage/Warranty.VRXWATCH0002.plist", "nonsense");
    expect({{command(vrxctl_, "all --policy refresh"), 1, {"no coverage record", "Watch Mini"}}});
    EXPECT_NE(shown.find("one\\u{a}two\\u{7f}\\u{9b}2J\\u{202e}\n"), std::string::npos) << shown;
}

TEST_F(CommandLine, FitsTheTerminal) {
    start();
    std::string profile = fileText(place_ / "device.toml");
    profile.replace(profile.find("Maya's Phone"), 12, "\u5e97\u306e\u96fb\u8a71\u306e\u9577\u3044\u540d\u524d");
    place_.write("device.toml", profile);
    ASSERT_EQ(place_.vrxctl({"all", "--policy", "refresh"}).code, 0);
    // Local time, and nothing shortened where output is piped.
    const std::string vrxctl = place_ / "app/vrxctl";
    EXPECT_NE(place_.run("/bin/sh", {"-c", "TZ=UTC-9 " + vrxctl + " info VRXWATCH0001"})
                  .output.find("covered until 2031-03-14 09:00, in "),
              std::string::npos);
    EXPECT_NE(place_.vrxctl({"--utc", "info", "VRXWATCH0001"}).output.find("until 2031-03-14 00:00 UTC, in "),
              std::string::npos);
    const std::string piped = place_.vrxctl({"all"}).output;
    for (const char* words : {"\u540d\u524d  VRXPHONE0001", "until 2031-03-14", "VRXWATCH0002"})
        EXPECT_NE(piped.find(words), piped.npos) << piped;
    EXPECT_EQ(piped.find_first_of("\x1b"), piped.npos);
    // Of a name the beginning stays, of an identifier the end.
    for (const auto& [words, shown, isWhole, isColoured] :
         {std::tuple("TERM=xterm", "\n\u5e97\u306e\u96fb", false, true),
          {"NO_COLOR=1 TERM=xterm", "HONE0001  Default  until 2", false, false},
          {"TERM=dumb", "NAME", false, false},
          {"TERM=xterm NO_COLOR= WIDE=--wide", "\u540d\u524d  VRXPHONE0001", true, true}}) {
        const std::string output =
            place_
                .run("/usr/bin/script",
                     {"-qec", std::string("stty cols 50; export ") + words + "; " + vrxctl + " all $WIDE", "/dev/null"})
                .output;
        EXPECT_NE(output.find(shown), output.npos) << output;
        EXPECT_EQ(output.find("\u2026") == output.npos, isWhole) << output;
        EXPECT_EQ(output.find("\x1b[1mNAME") != output.npos, isColoured) << output;
    }
}

// The agent does nothing else meanwhile that would download the record.
TEST_F(CommandLine, TakesADamagedCacheFileForAbsentUntilTheNextDownload) {
    start();
    expect({{command(vrxctl_, "info VRXWATCH0001 --policy refresh"), 0}});
    std::filesystem::resize_file(*value(vrxhost_, "cache VRXWATCH0001")["path"].asString(), 100);
    EXPECT_EQ(value(vrxhost_, "cache VRXWATCH0001")["error"]["kind"], Value("damaged"));
    for (const auto& [policy, code] : {std::pair("cached", 1), {"default", 0}, {"cached", 0}})
        expect({{command(vrxctl_, std::string("info VRXWATCH0001 --policy ") + policy), code}});
}

TEST_F(CommandLine, TellsThatThereIsNoAgent) {
    expectAll(vrxctl_, vrxctlVerbs, 3,
              {place_ / "socket", "systemctl --user start vrxagent", "--socket", "vrxhost doctor"});
    expectAll(vrxhost_, vrxhostVerbs, 3, {place_ / "home", "gent", "--home"});
    EXPECT_FALSE(std::filesystem::exists(place_ / "home"));
}

TEST_F(CommandLine, TellsThatItIsRefused) {
    start();
    std::filesystem::create_directory(place_ / "elsewhere");
    std::filesystem::copy(place_ / "app/vrxctl", place_ / "elsewhere");
    Arguments other = vrxctl_;
    other[0] = place_ / "elsewhere/vrxctl";
    Texts named{"com.orvane.private.vrxagent", "bundle.toml", "vrxhost doctor", other[0]};
    expectAll(other, vrxctlVerbs, 4, named);
    // A bundle that anyone could have written entitles to nothing.
    place_.setMode("app/bundle.toml", 0646);
    named.back() = vrxctl_[0];
    expectAll(vrxctl_, {{"device", ""}}, 4, named);

    // Another user's home.
    place_.setMode("", 0755);
    place_.setMode("home", 0);
    other = vrxhost_;
    if (getuid() == 0)
        other.insert(other.begin(), {"/usr/bin/setpriv", "--reuid", "65534", "--regid", "65534", "--clear-groups"});
    expectAll(other, vrxhostVerbs, 3, {place_.path(), "as the agent's user"});
    // With a socket that everybody may use, as the system's agent has it, nothing is wrong.
    place_.setMode("socket", 0666);
    place_.setMode("app/bundle.toml", 0644);
    const Place::Outcome checks = place_.runAll({command(other, "doctor --timeout 4")}).front();
    EXPECT_EQ(checks.code, 0) << checks.errors;
    EXPECT_NE(checks.output.find("may look into it"), std::string::npos) << checks.output;
    EXPECT_NE(checks.output.find("process " + std::to_string(place_.agent().identifier()) + " of "), std::string::npos);
    place_.setMode("home", 0700);
}

TEST_F(CommandLine, TellsThatNobodyAnswersInTime) {
    host::ListeningSocket agent;
    ASSERT_FALSE(agent.open(place_ / "socket"));
    const host::LoopbackServer silent([](const auto&) { return ""; });
    Arguments hasty = vrxctl_;
    hasty.insert(hasty.end(), {"--timeout", "0.2"});
    expectAll(hasty, vrxctlVerbs, 5, {"0.2 s", "--timeout"});
    // A terminal shows that it takes long, until it is over; a pipe holds nothing of it.
    const std::string slowly = place_ / "app/vrxctl" + " device --json --timeout 0.7 --socket " + place_ / "socket";
    const std::string terminal =
        place_.run("/usr/bin/script", {"-qec", slowly + " >" + place_ / "out", "/dev/null"}).output;
    const std::string line = "waiting for the agent…";
    EXPECT_NE(terminal.find("\r" + line + "\r" + std::string(line.size(), ' ') + "\rvrxctl: "), terminal.npos)
        << terminal;
    EXPECT_TRUE(fileText(place_ / "out").starts_with("{"));
    EXPECT_EQ(place_.run("/bin/sh", {"-c", slowly}).errors.find(line), std::string::npos);

    // An agent that has the home and does nothing more.
    host::HomeLock home;
    ASSERT_FALSE(home.take(place_ / "home"));
    host::Database database(place_ / "home/host.db");
    ASSERT_FALSE(database.open());
    expect({{command(vrxhost_, "followups post pending.json"), 0}});
    for (const char* key : {"ServerVersionURL", "WarrantyURL"})
        EXPECT_EQ(value(vrxhost_, std::string("defaults write ") + key + " --string " + silent.url())["ok"],
                  Value(true));
    expect({{command(vrxhost_, "fire outreach --timeout 0.2"), 5, {"0.2 s", "--timeout"}}});
    // Then one that holds the database besides: also from one that watches it, which is to end when it is told to.
    host::Pipe lines;
    Process watch(place_.path(), vrxhost_[0], {"--home", place_ / "home", "followups", "--watch"}, {},
                  {.output = lines.writer.number()});
    char first = 0;
    EXPECT_EQ(read(lines.reader.number(), &first, 1), 1);
    EXPECT_FALSE(database.write([&](host::Connection&) {
        place_.write("home/change", "");  // which it takes for one of the database
        std::vector<Case> cases;
        for (const Verb& verb : vrxhostVerbs) {
            const std::string words = verb.words;
            Texts named{place_ / "home/host.db", "locked", "fuser"};
            if (words.starts_with("doctor")) named = {"does not answer", "systemctl --user restart vrxagent"};
            if (verb.hung != 5) named.clear();
            if (!words.ends_with("--watch")) cases.push_back({command(vrxhost_, words), verb.hung, named});
        }
        expect(cases);
        watch.signal(SIGTERM);
        EXPECT_EQ(watch.wait(), 0) << watch.errors();
    }));
}

TEST_F(CommandLine, TellsWhatElseIsInTheWay) {
    place_.write("file", "");
    std::filesystem::create_directories(place_ / "folder/host.db");
    place_.write("damaged/host.db", std::string(8192, 'x'));
    std::vector<Case> cases;
    for (const char* words : {"why X", "activities", "followups", "cache X", "defaults list"})
        for (const char* home : {"file", "folder", "damaged"}) {
            const bool isFile = home == std::string("file");
            cases.push_back({command({vrxhost_[0], "--home", place_ / home}, words),
                             isFile ? 3 : 1,
                             {place_ / home + "/host.db", isFile ? "--home" : "vrxhost doctor"}});
        }
    place_.write("held/host.db", "");
    const host::Descriptor held(open((place_ / "held").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    ASSERT_EQ(flock(held.number(), LOCK_EX), 0);
    cases.push_back(
        {command({vrxhost_[0], "--home", place_ / "held"}, "defaults list"), 5, {"another process", "fuser"}});
    expect(cases);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(place_ / "damaged"), {}), 1)
        << "to look changes nothing";
    // From a folder that is gone there is no way to a home.
    std::filesystem::create_directory(place_ / "gone");
    const Place::Outcome gone =
        place_.run("/bin/sh", {"-c", "cd \"$0\" && rmdir \"$0\" && exec \"$1\" --json --home home defaults list",
                               place_ / "gone", vrxhost_[0]});
    EXPECT_EQ(gone.code, 1) << gone.errors;
    EXPECT_EQ(gone.document["error"]["kind"], Value("failed")) << gone.output;
}

TEST_F(CommandLine, TellsWhatIsWrongWithItsArguments) {
    std::vector<Case> cases;
    for (const char* words :
         {"", "nothing", "device extra", "device --policy cached", "info A B", "info --policy fresh",
          "info --policy -1", "info --policy 18446744073709551616", "all --timeout 0", "all --timeout nan",
          "all --timeout 1s", "all --bogus", "dismiss", "store", "support a b"})
        cases.push_back({command(vrxctl_, words), 2, {"See vrxctl", " --help."}});
    for (const char* verb : {"info", "dismiss"}) {
        cases.push_back({command(vrxctl_, verb), 2, {"it is empty"}});
        cases.back().command.emplace_back();
    }
    for (const char* words :
         {"defaults", "defaults read", "defaults write K", "defaults write K text", "defaults write K null",
          "defaults write K {\"a\":null}", "defaults write K 1 --int 2", "defaults write K --date today",
          "defaults list --device x", "followups clear", "followups post x --watch", "followups --device x clear y",
          "cache", "why", "fire", "fire a --timeout -1", "activities x", "doctor --timeout 0"})
        cases.push_back({command(vrxhost_, words), 2, {"See vrxhost", " --help."}});
    for (const auto& [words, problem] : std::map<std::string, Texts>{
             {"defaults wite K", {"there is no verb wite; did you mean write?", "vrxhost defaults --help"}},
             {"activites", {"there is no verb activites; did you mean activities?", "vrxhost --help"}},
             {"folow", {"did you mean followups?"}},
             {"xyzzy", {"there is no verb xyzzy\n"}},
             {"followups post x --devise=y", {"there is no option --devise; did you mean --device?"}},
             {"fire a --jsn", {"there is no option --jsn; did you mean --json?", "vrxhost fire --help"}},
             {"why a b", {"why takes no further argument: b"}},
             {"defaults", {"a verb is needed: list, read, write, delete"}}})
        cases.push_back({command(vrxhost_, words), 2, problem});
    for (const char* words : {"--help", "info --help", "--version"}) cases.push_back({command(vrxctl_, words), 0});
    expect(cases);
    // The programs without verbs say it in the same way.
    const std::string programs = VRX_PROGRAMS "/";
    for (const auto& [program, argument, problem] :
         {std::tuple("vrxagent", "--log-level=x", "--log-level: 'x' is neither debug, default nor error"),
          {"vrxagent", "--hoem=x", "there is no option --hoem; did you mean --home?"},
          {"vrx-coverage-server", "--porrt=1", "there is no option --porrt; did you mean --port?"}}) {
        const Place::Outcome outcome = place_.run(programs + program, {argument});
        EXPECT_EQ(outcome.code, 2);
        EXPECT_EQ(outcome.errors, std::string(program) + ": " + problem + "\nSee " + program + " --help.\n");
        EXPECT_TRUE(place_.run(programs + program, {"--version"}).output.starts_with(std::string(program) + " "));
    }
    // A verb's help and completion list what it takes, and completions offer no word that a shell would run.
    const std::string help = place_.vrxctl({"info", "--help"}).output;
    for (const char* option : {"--policy", "--socket", "--json"}) EXPECT_NE(help.find(option), help.npos) << option;
    start();
    std::string profile = fileText(place_ / "device.toml");
    profile.replace(profile.find("VRXWATCH0002"), 12, "$(reboot)");
    place_.write("device.toml", profile);
    for (const Arguments& program : {vrxctl_, vrxhost_}) {
        Arguments words = program;
        words.insert(words.end(), {"--candidates", "SERIAL"});
        EXPECT_EQ(place_.runAll({words}).front().output, "VRXPHONE0001\nVRXWATCH0001\n");
    }
}

}  // namespace
}  // namespace vrx::end_to_end
