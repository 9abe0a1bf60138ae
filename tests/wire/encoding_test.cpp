#include "vrx/wire/encoding.h"

#include <sys/socket.h>
#include <systemd/sd-bus.h>
#include <unistd.h>

#include <functional>

#include "support/values.h"
#include "vrx/wire/message.h"

namespace vrx::wire {
namespace {

using platform::Result;

class Encoding : public testing::Test {
protected:
    // A bus that has begun to authenticate itself at a socket at which nobody answers: enough to make messages with.
    Encoding() {
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
        EXPECT_GE(sd_bus_new(&bus), 0);
        EXPECT_GE(sd_bus_set_fd(bus, ends[0], ends[0]), 0);
        EXPECT_GE(sd_bus_start(bus), 0);
    }
    ~Encoding() override {
        sd_bus_close_unref(bus);
        ::close(ends[1]);
    }

    MessagePointer newMessage() {
        sd_bus_message* message = nullptr;
        EXPECT_GE(sd_bus_message_new_signal(bus, &message, "/", "test.Test", "Test"), 0);
        return MessagePointer(message);
    }

    // What a reader makes of what was appended.
    Result<Value> read(const std::function<int(sd_bus_message*)>& append) {
        const MessagePointer message = newMessage();
        const int r = append(message.get());
        EXPECT_GE(r, 0) << strerror(-r);
        EXPECT_GE(sd_bus_message_seal(message.get(), 1, 0), 0);
        EXPECT_GE(sd_bus_message_rewind(message.get(), 1), 0);
        return readReply(message.get());
    }

    Value roundTrip(const Value& value) {
        return valueOf(read([&](sd_bus_message* message) { return appendReply(message, value); }));
    }

    // What a hostile agent could send: the root's variant, of any type.
    template <class... Args>
    Result<Value> readRoot(const char* type, Args... args) {
        return read(
            [&](sd_bus_message* message) { return sd_bus_message_append(message, "a{sv}", 1, "root", type, args...); });
    }

    sd_bus* bus = nullptr;
    int ends[2];
};

TEST_F(Encoding, CarriesEveryValueAndKey) {
    const Value value = Dictionary{
        {"flags", Array{true, false}},
        {"integers", Array{0, -1, INT64_MAX, INT64_MIN}},
        {"doubles", Array{0.5, -1e300, 1.0}},
        {"dates", Array{dateFromEpoch(0), dateFromEpoch(-1.25)}},
        {"texts", Array{"", "plain", "\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80", "longer than eight bytes \xc3\xa4 too"}},
        {"uncarried", Array{std::string("\0", 1), std::string("12345678\0abc", 12), "\xef\xbf\xbf", "\xef\xb7\xa0",
                            "\xf4\x8f\xbf\xbe", "\xed\xa0\x80", "\xff\xfe", "\xc0\x80", "abcdefg\x80"}},
        {"", "empty"},
        {"$class", "tag"},
        {"$$x", "doubled"},
        {std::string("nul\0", 4), 1},
        {"\xef\xbf\xbe", 2},
        {"\xff", 3},
        {"containers", Array{Array{}, Dictionary{}}},
    };
    EXPECT_EQ(roundTrip(value), value);
    EXPECT_EQ(roundTrip(value)["doubles"].asArray()->at(2).type(), Value::Type::Double);
    for (const Value& scalar : {Value(true), Value(7), Value("x"), Value(dateFromEpoch(1))})
        EXPECT_EQ(roundTrip(scalar), scalar);
}

TEST_F(Encoding, LeavesOutNullsAndData) {
    EXPECT_TRUE(roundTrip(nullptr).isNull());
    EXPECT_TRUE(roundTrip(Data{1, 2}).isNull());
    EXPECT_EQ(roundTrip(Dictionary{{"a", nullptr}, {"b", Data{1}}, {"c", Array{nullptr, 1, Data{}}}}),
              Value(Dictionary{{"c", Array{1}}}));
}

TEST_F(Encoding, HasADepth) {
    Value value = 1;
    for (int depth = 0; depth < replyDepth; ++depth) value = Array{value};
    EXPECT_EQ(roundTrip(value), value);
    EXPECT_EQ(appendReply(newMessage().get(), Array{value}), -ELOOP);

    // Hostile: deeper than any writer of ours goes, and without a value anywhere.
    Result<Value> deep = read([](sd_bus_message* message) {
        int r = sd_bus_message_open_container(message, 'a', "{sv}");
        if (r >= 0) r = sd_bus_message_open_container(message, 'e', "sv");
        if (r >= 0) r = sd_bus_message_append_basic(message, 's', "root");
        for (int depth = 0; depth <= replyDepth && r >= 0; ++depth) {
            r = sd_bus_message_open_container(message, 'v', "av");
            if (r >= 0) r = sd_bus_message_open_container(message, 'a', "v");
        }
        for (int open = 0; open < 2 * (replyDepth + 1) + 2 && r >= 0; ++open)
            r = sd_bus_message_close_container(message);
        return r;
    });
    ASSERT_FALSE(deep);
    EXPECT_EQ(deep.error().text, "the reply is nested too deep");
}

TEST_F(Encoding, RefusesWhatItDoesNotGive) {
    const std::uint8_t byte = 'x';
    EXPECT_FALSE(readRoot("u", 7u)) << "a type that it does not have";
    EXPECT_FALSE(readRoot("as", 1, "x"));
    EXPECT_FALSE(readRoot("v", "i", 7));
    EXPECT_FALSE(readRoot("(sd)", "$when", 1.0)) << "an unknown tag";
    EXPECT_FALSE(readRoot("(say)", "$string", 1, byte)) << "a plain string as bytes";
    EXPECT_FALSE(readRoot("a{sv}", 2, "k", "b", 1, "k", "b", 0)) << "a key twice";
    EXPECT_FALSE(readRoot("a{sv}", 1, "$x0", "b", 1)) << "half a byte";
    EXPECT_FALSE(readRoot("a{sv}", 1, "$x0G", "b", 1)) << "no digits";
    EXPECT_FALSE(readRoot("a{sv}", 1, "$x24636c617373", "s", "VRXDevice")) << "a class tag in disguise";
    EXPECT_TRUE(readRoot("a{sv}", 1, "$x00", "b", 1));
    auto body = [&](const char* types, auto... args) {
        return read([&](sd_bus_message* message) { return sd_bus_message_append(message, types, args...); });
    };
    EXPECT_FALSE(body("s", "no dictionary"));
    EXPECT_FALSE(body("a{sv}s", 0, "more"));
    EXPECT_FALSE(body("a{sv}", 1, "other", "b", 1));
    EXPECT_FALSE(body("a{sv}", 2, "root", "b", 1, "other", "b", 1));
    EXPECT_FALSE(read([](sd_bus_message*) { return 0; })) << "nothing at all";
}

}  // namespace
}  // namespace vrx::wire
