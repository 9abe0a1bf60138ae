// What is counted of a fleet: each request that left a device, once, under what began it, however the lives are shared
// out.
#include "vrxsim/fleet.h"

#include <array>
#include <fstream>

#include "support/values.h"
#include "vrx/codec/json.h"
#include "vrxsim/player.h"

namespace vrx::simulation {
namespace {

const Counts& coverageOf(const Census& census) {
    return census.servers[0];
}

const Counts& versionsOf(const Census& census) {
    return census.servers[1];
}

std::map<std::string, std::uint64_t> totalsOf(const Counts& counts) {
    std::map<std::string, std::uint64_t> totals;
    for (std::size_t i = 0; i < causeCount; ++i)
        if (const std::uint64_t total = counts.total(static_cast<Cause>(i)); total > 0)
            totals[std::string(describe(static_cast<Cause>(i)))] = total;
    return totals;
}

TEST(Fleet, CountsWhatLeavesADeviceByItsCause) {
    Resident resident{.life = lifeFrom("life 6\nrecord PHONE 0 100 0 1 -\nrecord WATCH1 - 100 0 0 -\npair WATCH1 -9\n"
                                       "day 3 ask 0 all PHONE 2\n"
                                       "day 3.5 server 401 1\nday 3.6 ask 0 all PHONE 0\nday 3.7 ask 0 all PHONE 2\n"
                                       "day 4 network off\nday 4.1 ask 0 all PHONE 2\nday 4.2 network on\n"
                                       "day 4.3 pair WATCH2 0\nday 5.2 language de_DE\nday 5.5 ask 0 all PHONE 1")
                                  .value()};
    Census census;
    count(resident, {.days = 6}, census);
    using Totals = std::map<std::string, std::uint64_t>;
    // Two devices, then three. The outreach is two days after the first start, and the post follows it at once.
    EXPECT_EQ(totalsOf(coverageOf(census)),
              (Totals{{"outreach", 2}, {"post", 2}, {"refresh", 4}, {"retry", 1}, {"pairing", 1}, {"language", 3}}));
    // It is kept for five minutes: for the post.
    EXPECT_EQ(totalsOf(versionsOf(census)), (Totals{{"outreach", 2}, {"refresh", 4}, {"pairing", 1}, {"language", 3}}));
    EXPECT_EQ(versionsOf(census).doubled, 5u);
    EXPECT_EQ(versionsOf(census).unchanged, 8u) << "all but the outreach's";
    EXPECT_EQ(coverageOf(census).inMinute(2 * minutesOfDay), 4u);
    EXPECT_EQ(coverageOf(census).connections, 5u);

    // The same by the agent's own log.
    std::uint64_t answers = 0;
    play(resident.life, {.show = [&](std::string_view line) {
             const std::size_t at = line.find("load warranty status: ");
             answers += at != line.npos && line[at + 22] != '0';
         }});
    EXPECT_EQ(coverageOf(census).requests, answers);

    resident.begin = -3 * 86400;  // the second half of it
    Census later;
    count(resident, {.days = 3}, later);
    EXPECT_EQ(coverageOf(later).total(Cause::Outreach), 0u);
    EXPECT_EQ(coverageOf(later).requests, coverageOf(census).requests - 4);
    EXPECT_EQ(coverageOf(later).inMinute(0), 2u);
}

TEST(Fleet, CountsWhatIsAskedForAnOfferThatHasEnded) {
    const Resident resident = residentFrom(1, {.days = 4, .hasImage = false, .endedShare = 100});
    Census census;
    count(resident, {.days = 4}, census);
    const double perDay = static_cast<double>(coverageOf(census).total(Cause::Post)) / 4;
    EXPECT_GE(perDay, 48) << "it is on for half of each day at least";
    EXPECT_LE(perDay, 96 * 3) << "for three devices at the most";
    const Play played = play(lifeFrom("life 6\nrecord PHONE - -20 60 1 -\nday 4.1 no-record PHONE").value());
    using Days = std::map<std::string, std::int64_t>;
    EXPECT_EQ(played.restlessDays, (Days{{"com.orvane.vrxagent.followuppost", 2}})) << "from the outreach of day 2 on";
}

TEST(Fleet, AddsUpTheSameForEachNumberOfJobs) {
    const Scenario scenario{.days = 4, .overHours = 4, .upgrade = 3, .language = 3, .languageShare = 50, .outage = 2.2};
    Census alone;
    for (std::uint64_t number = 5; number < 25; ++number) count(residentFrom(number, scenario), scenario, alone);
    EXPECT_GT(coverageOf(alone).requests, 40u);
    for (const int jobs : {1, 3}) {
        const Census census =
            simulation::census({.scenario = scenario, .lives = 20, .firstNumber = 5, .jobs = jobs}).value();
        EXPECT_EQ(census.lives, 20u);
        for (std::size_t i = 0; i < serverCount; ++i) {
            const Counts &one = alone.servers[i], &other = census.servers[i];
            EXPECT_EQ(std::tie(one.minutes, one.requests, one.squares, one.unchanged, one.doubled, one.connections),
                      std::tie(other.minutes, other.requests, other.squares, other.unchanged, other.doubled,
                               other.connections));
        }
    }
}

TEST(Fleet, WritesTheSameNumbersInEachForm) {
    const std::string csv = testing::TempDir() + "fleet-" + std::to_string(getpid()) + ".csv";
    const std::string command =
        std::string(VRX_PROGRAMS "/vrxsim fleet --days 3 --devices 100 --lives 30 --json --csv ") + csv;
    FILE* const program = popen(command.c_str(), "r");
    std::string text(100'000, ' ');
    text.resize(fread(text.data(), 1, text.size(), program));
    ASSERT_EQ(pclose(program), 0);
    const Value document = codec::parseJson(text).value();
    EXPECT_EQ(document["devices"], Value(100));
    EXPECT_EQ(document["lives"], Value(25)) << "four devices each";

    std::map<std::string, std::int64_t> expected, written;
    for (const Value& server : *document["servers"].asArray()) {
        std::int64_t sum = 0;
        for (const Value& cause : *server["causes"].asArray())
            sum += expected[*server["server"].asString() + "," + *cause["cause"].asString()] =
                *cause["requests"].asInteger();
        EXPECT_EQ(server["requests"], Value(sum));
    }
    std::ifstream lines(csv);
    std::string line;
    std::getline(lines, line);
    EXPECT_EQ(line, "minute,server,cause,requests");
    while (std::getline(lines, line)) {
        const std::size_t first = line.find(','), last = line.rfind(',');
        written[line.substr(first + 1, last - first - 1)] += std::stoll(line.substr(last + 1));
    }
    EXPECT_EQ(written, expected);
    EXPECT_GT(written.size(), 3u);
    remove(csv.c_str());
}

}  // namespace
}  // namespace vrx::simulation
