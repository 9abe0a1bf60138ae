// Lives and their plays: a life reads as it was written, plays the same way each time, breaks no rule unless the host
// itself has a defect, and then is made small.
#include <set>

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

TEST(Life, PlaysTheSameWayEachTime) {
    std::set<std::uint64_t> traces;
    for (const Trouble level : levels) {
        const Life life = lifeFromSeed(7, level);
        const Play first = play(life);
        EXPECT_EQ(first.violation ? first.violation->detail : "", "");
        EXPECT_EQ(play(lifeFrom(textOf(life)).value()).trace, first.trace);
        EXPECT_EQ(playApart(life).trace, first.trace);
        traces.insert(first.trace);
    }
    EXPECT_EQ(traces.size(), 3u);
}

TEST(Exploration, FindsEveryDefectAndNothingElse) {
    const auto firstBroken = [](sim::Defect planted) {
        std::string rule = "none";
        explore({.last = 60, .planted = planted}, [&](std::uint64_t, const Play& play) {
            if (play.violation) rule = play.violation->rule;
            return !play.violation;
        });
        return rule;
    };
    EXPECT_EQ(firstBroken(sim::Defect::None), "none");
    for (const NamedDefect& named : namedDefects()) {
        const std::string rule = firstBroken(named.defect);
        EXPECT_NE(rule, "none") << named.name;
        EXPECT_NE(rule, crash) << named.name;
    }
}

TEST(Shrinker, LeavesWhatIsNeededAlone) {
    const auto brokenRule = [](const Life& life) {
        const Play played = play(life, {.planted = sim::Defect::ItemDoubled});
        return played.violation ? played.violation->rule : std::string();
    };
    const Life life = lifeFromSeed(1, Trouble::Wild);
    const Life smaller = shrunk(life, brokenRule);
    EXPECT_EQ(brokenRule(smaller), "one-item");
    EXPECT_LE(smaller.beginning.size() + smaller.events.size(), 3u) << textOf(smaller);
    EXPECT_LT(smaller.days, life.days);
}

}  // namespace
}  // namespace vrx::simulation
