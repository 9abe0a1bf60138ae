// What the agent's rules give against what is wished for: each difference occurs in a life of its own, under its name
// and no other.
#include <iterator>
#include <set>

#include "support/values.h"
#include "vrxsim/player.h"

namespace vrx::simulation {
namespace {

TEST(Differences, HaveTheNameOfTheirCause) {
    const std::string early = "first-days", watchEarly = "before-outreach";
    const std::string phoneShown = "record PHONE 0 40 - 1 -\n", watch = "pair WATCH1 -30\nrecord WATCH1 ";
    const struct {
        int days;
        std::string life;
        std::set<std::string> names;
        Way way = Way::Missed;
    } lives[] = {
        {4, phoneShown, {early}},
        {4, watch + "0 40 - 1 -", {watchEarly}},
        {20, "day 5 record PHONE 0 40 - 1 -", {"offer-after-outreach"}},
        {4, phoneShown + "day 1.9 server 500 9", {early, "failed-look"}},
        {8, phoneShown + "day 4.5 account out\nday 6 account in", {early, "signed-out"}},
        {8, phoneShown + "day 5 server 500 3\nday 5 language de_DE", {early, "language-change"}},
        {8, phoneShown + "day 4.9 fail read 1", {early, "failed-read"}},
        {12, phoneShown + "day 5.1 server huge 1\nday 5.1 ask 0 info PHONE 2", {early, "strange-answer"}},
        {12, watch + "0 40 - 1 -\nday 5 unpair WATCH1\nday 6 pair WATCH1 -30", {watchEarly, "paired-again"}},
        {12, "record PHONE 0 5 - 1 -\nday 6 record PHONE 0 40 - 1 -", {early, "offer-renewed"}},
        {12, phoneShown + "day 5 dismiss PHONE\nday 6 take-back", {early, "taken-back"}},
        {12, watch + "0 40 - 1 -\nday 5.1 flag off\nday 7 flag on", {watchEarly, "watches-off"}},
        {12, "record PHONE 0 40 - 1 26201\ncarrier 26201\nday 5 carrier none", {"carrier-at-outreach"}},
        {12, "record PHONE 0 40 - 1 26201\nday 5 carrier 26201", {early, "carrier-at-outreach"}, Way::Needless},
        {20, phoneShown + watch + "- 40 30 1 -", {early, "days-before-end"}},
        {20, phoneShown + watch + "10 40 - 1 -\npair WATCH2 -30\nrecord WATCH2 0 - - 1 -", {early, "no-end"}},
        {20, phoneShown + "record WATCH1 0 40 - 1 -\nday 5 pair WATCH1 -30", {early, "due-at-pairing"}},
        {20, "record WATCH1 0 40 - 1 -\nday 5 kill-before-call 1 0\nday 5 pair WATCH1 5", {early, "pairing-cut-short"}},
        {20, phoneShown + "day 5 no-record PHONE", {early, "unseen-record"}, Way::Needless},
        {20,
         phoneShown + "day 5.01 no-record PHONE\nday 5.01 ask 0 all PHONE 2",
         {early, "refresh-waits"},
         Way::Needless},
        {20,
         phoneShown + "day 5.01 record PHONE 10 40 - 1 -\nday 5.01 ask 0 info PHONE 2",
         {early, "display-moved"},
         Way::Needless},
        {9, "record PHONE 0 5.25 - 1 -\n" + watch + "0 40.75 - 1 -", {early, watchEarly, "last-day"}, Way::Needless},
        {12,
         "pair WATCH1 -\nrecord WATCH1 0 40.5 - 1 -\npair WATCH2 -30\nrecord WATCH2 0 41 - 1 -",
         {watchEarly, "no-activation"},
         Way::OldText},
        {12, "record PHONE 30 40 - 1 -\nold-layout 40", {"unseen-record", "older-layout"}, Way::Needless},
        {12,
         phoneShown + "day 5.3 record PHONE 0 30 - 1 -\nday 5.3 fail replace 1\nday 5.3 ask 0 all PHONE 2",
         {early, "failed-write"},
         Way::OldText},
        {8, phoneShown + "day 4.9 fail list 1", {early, "failed-listing"}, Way::OldText},
        {8, phoneShown + "day 1.9 fail post 1", {early, "refused"}},
        {12,
         watch + "0 40 - 1 -\nday 4.9 fail clear 1\nday 4.9 flag off\nday 5.5 flag on\nday 5.6 ask 0 serial WATCH1 0",
         {watchEarly, "refused"},
         Way::OldText},
        // Killed between the post and the plan of its refresh.
        {9,
         "record PHONE 10 10 0 1 -\npair WATCH1 0\nrecord WATCH1 6 40.75 - 1 -\nday 5 kill-before-call 58 0",
         {"plan-cut-short"},
         Way::OldText},
        {9,
         watch + "0 40 - 1 -\nday 5.5 fail list 1\nday 5.5 unpair WATCH1",
         {watchEarly, "failed-listing"},
         Way::Needless},
        {8, phoneShown + "day 4.5 fail clear 1\nday 4.5 dismiss PHONE", {early, "dismissal-lost"}, Way::Needless},
        {10,
         phoneShown + "day 4.5 clock 8640000\nday 5 clock -8640000\nday 5.1 ask 0 outreach PHONE 0",
         {early, "clock-set"},
         Way::Needless},
        {12, phoneShown + "day 4.5 clock 8640000\nday 6 clock -8640000", {early, "clock-set", "wrong-clock"}},
    };
    std::set<std::string_view> occurred;
    for (const auto& [days, text, names, way] : lives) {
        const Play played = play(lifeFrom("life " + std::to_string(days) + "\n" + text).value());
        std::set<std::string> found;
        bool isInThisWay = false;
        for (const auto& [name, seconds] : played.differences) {
            found.insert(std::string(name));
            occurred.insert(name);
            isInThisWay = isInThisWay || (name != early && seconds[static_cast<std::size_t>(way)] > 0);
        }
        EXPECT_EQ(found, names) << text;
        EXPECT_TRUE(isInThisWay || found == std::set{early}) << text;
        EXPECT_EQ(played.violation ? played.violation->detail : "", "") << text;
    }
    EXPECT_EQ(occurred.size(), namedDifferences().size());
}

}  // namespace
}  // namespace vrx::simulation
