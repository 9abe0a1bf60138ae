// The texts that log lines are made of, and the lines.
#include "vrx/platform/text.h"

#include <thread>

#include "support/values.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/value.h"
#include "vrx/sim/host.h"

namespace vrx::platform {
namespace {

TEST(Describe, GivesTheTextOfAnyValue) {
    EXPECT_EQ(Value().description(), "(null)");
    EXPECT_EQ(describe(std::optional<std::string>()), "(null)");
    EXPECT_EQ(describe(std::shared_ptr<Value>()), "(null)");
    EXPECT_EQ(describe(static_cast<const char*>(nullptr)), "(null)");
    EXPECT_EQ(describe(1.0), "1");
    EXPECT_EQ(describe(0.1), "0.1");
    EXPECT_EQ(describe(std::set<std::int64_t>{3, 2}), "{2, 3}");
    EXPECT_EQ(Value(Dictionary{{"b", Array{1, "x", true}}, {"a", nullptr}}).description(),
              "{a = (null); b = (1, x, 1);}");
    EXPECT_EQ(Value(Data{1, 2}).description(), "<2 bytes>");
    EXPECT_EQ(Error({"http", 7, "refused"}).description(), "refused (http 7)");
}

TEST(Describe, GivesDatesInTheCalendarAndBeyondIt) {
    EXPECT_EQ(describe(dateFromEpoch(1769860800.9)), "2026-01-31 12:00:00 +0000");
    EXPECT_EQ(describe(dateFromEpoch(-0.5)), "1969-12-31 23:59:59 +0000");
    EXPECT_EQ(describe(dateFromEpoch(1709164800)), "2024-02-29 00:00:00 +0000");
    EXPECT_EQ(describe(dateFromEpoch(-62135596800.0)), "0001-01-01 00:00:00 +0000");
    EXPECT_EQ(describe(dateFromEpoch(253402300799.0)), "9999-12-31 23:59:59 +0000");
    for (double beyond : {253402300800.0, -62135596800.5, 1e300, std::nan("")})
        EXPECT_NE(describe(dateFromEpoch(beyond)).find("from 1970-01-01"), std::string::npos) << beyond;
}

TEST(Filled, ReplacesPlaceholdersInTurnAndOnlyThose) {
    EXPECT_EQ(filled("%@_%@ %@", {"%@", "b"}), "%@_b %@");
    EXPECT_EQ(filled("none", {"a"}), "none");
    EXPECT_EQ(filled("", {}), "");
}

TEST(Sha256Hash, IsThePublishedOneOfTheTextUpToItsFirstNulOnAnyThread) {
    sim::Host host;
    const std::pair<std::string, const char*> texts[] = {
        {"", "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855"},
        {{"abc\0def", 7}, "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"},
        {std::string(1'000'000, 'a'), "cdc76e5c9914fb9281a1c7e284d73e67f1809a48a497200e046d39ccc7112cd0"},
    };
    std::vector<std::jthread> threads;
    for (const auto& [text, hash] : texts)
        threads.emplace_back([&text = text, &hash = hash] { EXPECT_EQ(sha256Hash(text), hash); });
}

TEST(Log, FillsEachPlaceholderAndRedactsWhatIsPrivate) {
    sim::Host host;
    log(Level::Default, "%s: %@ %{private}@ (%d/%d) %ld %lu %.02f s%@", "-[Class operation:]",
        std::optional<std::string>(), "S%@1", true, -2, std::int64_t{-3}, std::uint64_t{4}, Duration(-0.125),
        RedactableText{" key", " ..."});
    ASSERT_EQ(host.log.entries().size(), 1u);
    const LogEntry& entry = host.log.entries()[0];
    EXPECT_EQ(entry.message(), "-[Class operation:]: (null) <private> (1/-2) -3 4 -0.12 s ...");
    EXPECT_EQ(entry.message(true), "-[Class operation:]: (null) S%@1 (1/-2) -3 4 -0.12 s key");
    EXPECT_TRUE(std::string_view(entry.file).ends_with("text_test.cpp"));
    EXPECT_FALSE(host.log.contains("%s")) << "asked for by whole formats";
}

TEST(Log, DescribesNoMoreOfAnArgumentThanItsLimit) {
    sim::Host host;
    const std::string text = std::string(limits::logArgumentBytes - 1, 'x') + "é" + std::string(9, 'y');
    log(Level::Default, "%@", text);
    log(Level::Default, "%@", Value(Array(100'000, Value(std::string(1000, 'x')))));
    const std::vector<std::string> lines = host.log.messages(Level::Default);
    EXPECT_EQ(lines.at(0), std::string(limits::logArgumentBytes - 1, 'x') + "... (11 more bytes)");
    EXPECT_LT(lines.at(1).size(), limits::logArgumentBytes + 100);
    EXPECT_EQ(describe(text), text) << "only the log is brief";
}

TEST(Log, PutsNoLineTogetherThatNobodyReads) {
    struct Costly {
        int* descriptions;
        std::string description() const { return std::to_string(++*descriptions); }
    };
    sim::Host host;
    int descriptions = 0;
    host.log.lowest = Level::Default;
    log(Level::Debug, "%@", Costly{&descriptions});
    EXPECT_EQ(descriptions, 0);
    log(Level::Error, "%@", Costly{&descriptions});
    EXPECT_THAT(host.log.messages(), ElementsAre("1"));
}

}  // namespace
}  // namespace vrx::platform
