// Lives and their plays: a life reads as it was written, plays the same way each time, breaks no rule unless the host
// itself has a defect, and then is made small.
#include <algorithm>
#include <map>
#include <set>
#include <tuple>

#include "support/values.h"
#include "vrxsim/apart.h"
#include "vrxsim/defects.h"
#include "vrxsim/generator.h"
#include "vrxsim/shrinker.h"

namespace vrx::simulation {
namespace {

constexpr Trouble levels[] = {Trouble::Calm, Trouble::Rough, Trouble::Wild};

TEST(Life, ReadsAsItWasWritten) {
    std::set<std::string> verbs;
    for (const Trouble level : levels)
        for (std::uint64_t seed = 1; seed <= 60; ++seed) {
            Life life = lifeFromSeed(seed, level);
            life.notes = {"of seed " + std::to_string(seed)};
            ASSERT_EQ(lifeFrom(textOf(life)).value(), life) << textOf(life);
            for (const Event& event : life.events) verbs.insert(event.verb);
        }
    EXPECT_EQ(verbs.size(), 33u) << "every verb but the one that only stands at the beginning";

    for (const char* line : {"day 1", "day x reboot 60", "day -1 reboot 60", "day 1 reboot", "day 1 reboot 6 0",
                             "day 1 reboot -1", "day 1 fly", "clock nan", "clock 1e99", "life 0", "life 1.5",
                             "seed 1 stormy", "pair WATCH1 yesterday", "day 1e300 upgrade"})
        EXPECT_THAT(lifeFrom(std::string("life 3\n\n# a note\n") + line).error().text, HasSubstr("line 4")) << line;
}

// The first days of a life, because a sanitizer takes its time.
Life shortLife(std::uint64_t seed, Trouble level, std::int64_t days) {
    Life life = lifeFromSeed(seed, level);
    life.days = std::min(life.days, days);
    return life;
}

TEST(Life, PlaysTheSameWayEachTime) {
    std::set<std::uint64_t> traces;
    for (const Trouble level : levels) {
        const Life life = shortLife(7, level, 30);
        const Play first = play(life);
        EXPECT_EQ(first.violation ? first.violation->detail : "", "");
        EXPECT_EQ(play(lifeFrom(textOf(life)).value()).trace, first.trace);
        EXPECT_EQ(playApart(life).trace, first.trace);
        traces.insert(first.trace);
    }
    EXPECT_EQ(traces.size(), 3u);
}

// A small life that shows each, and breaks no rule without it.
TEST(Defects, AreAllFound) {
    const std::tuple<const char*, const char*, const char*> lives[] = {
        {"setting-lost", "fires", "life 3\nrecord PHONE 0 0 0 1 -\nday 1 ask 0 all PHONE 0"},
        {"setting-stale", "dismissed",
         "life 273\nday 269 dismiss WATCH2\nday 271 language hi_IN\nday 272 dismiss WATCH1"},
        {"setting-forgotten", "dismissed",
         "life 29\nday 3 reboot 0\nday 17 reboot 0\nday 26 dismiss WATCH2\nday 28 reboot 0"},
        {"post-lost", "as-the-rules",
         "life 32\nrecord PHONE 15 44 0 1 -\nday 19 pair WATCH2 0\nday 22 versions 0 0\nday 23 kill-before-call 18 "
         "0\nday 26.45833 ask 0 all-update PHONE 2\nday 27 versions 0 2\nday 31 ask 0 outreach WATCH1 0"},
        {"clear-lost", "acknowledged",
         "life 32\nrecord WATCH1 0 100.75 - 1 -\nday 26 ask 0 all-update PHONE 0\nday 27 pair WATCH1 0\nday 31 ask 0 "
         "outreach PHONE 0\nday 31.625 account out"},
        {"item-doubled", "one-item", "life 3\nrecord PHONE 0 3 0 1 -"},
        {"file-torn", "whole-file",
         "life 12\nrecord PHONE 0 0 0 0 -\nday 1 ask 0 all PHONE 0\nday 11 ask 0 all-update WATCH2 0"},
        {"firing-lost", "fires", "life 3"},
        {"firing-late", "will-fire", "life 1"},
        {"firing-early", "not-early",
         "life 124\npair WATCH1 -\npair WATCH2 0\nday 92 record WATCH1 127 137 - 1 -\nday 117 unpair WATCH2\nday 120 "
         "pair WATCH2 0"},
        {"firing-again", "few-runs", "life 1"},
        {"handler-twice", "one-run", "life 3"},
        {"row-forgotten", "will-fire",
         "life 199\nday 153 record PHONE 200.5 0 - 1 -\nday 163 ask 0 outreach WATCH3 0\nday 168 reboot 0\nday 174 "
         "reboot 0\nday 198 reboot 0"},
        {"clock-not-carried", "will-fire",
         "life 15\nrecord WATCH2 - 27 0 1 -\npair WATCH2 0\nday 0 reboot 0\nday 14 reboot 0"},
        {"reply-dropped", "one-reply",
         "life 12\nday 1 ask 0 all PHONE 0\nday 5 ask 0 url WATCH2 0\nday 11 ask 0 all-update WATCH2 0"},
        {"answer-lost", "fires", "life 3\nday 1 ask 0 all PHONE 0"},
        {"notification-lost", "told",
         "life 55\nold-layout 51\nday 23 language de_DE\nday 49 language ar_EG\nday 54 language de_DE"},
    };
    ASSERT_EQ(std::size(lives), namedDefects().size());
    for (const auto& [name, rule, text] : lives) {
        const Life life = lifeFrom(text).value();
        const Play planted = play(life, {.planted = defectFrom(name).value()});
        EXPECT_EQ(planted.violation ? planted.violation->rule : "none", rule) << name;
        const Play sound = play(life);
        EXPECT_EQ(sound.violation ? sound.violation->detail : "", "") << name;
    }
}

TEST(Exploration, PlaysEachLifeAsItWouldAlone) {
    const auto traces = [](int jobs) {
        std::map<std::uint64_t, std::uint64_t> result;
        explore({.first = 3, .last = 6, .jobs = jobs, .mostDays = 15},
                [&](std::uint64_t seed, const Play& play) { return result.emplace(seed, play.trace).second; });
        return result;
    };
    const auto alone = traces(1);
    EXPECT_EQ(alone.size(), 4u);
    EXPECT_EQ(traces(3), alone);
}

TEST(Shrinker, LeavesWhatIsNeededAlone) {
    const auto brokenRule = [](const Life& life) {
        const Play played = play(life, {.planted = sim::Defect::ItemDoubled});
        return played.violation ? played.violation->rule : std::string();
    };
    const Life life = shortLife(1, Trouble::Rough, 20);
    const Life smaller = shrunk(life, brokenRule);
    EXPECT_EQ(brokenRule(smaller), "one-item");
    EXPECT_LE(smaller.beginning.size() + smaller.events.size(), 3u) << textOf(smaller);
    EXPECT_LT(smaller.days, life.days);
}

}  // namespace
}  // namespace vrx::simulation
