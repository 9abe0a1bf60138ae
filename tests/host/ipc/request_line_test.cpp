#include "vrx/host/ipc/request_line.h"

#include "host/support.h"

namespace vrx::host {
namespace {

using Waiter = RequestLine::Waiter;

TEST(RequestLine, SharesPlacesAmongUsersWhileOneWaits) {
    RequestLine line({.requests = 4, .requestsPerUser = 2});
    int wakeUps = 0;
    const auto wake = [&] { ++wakeUps; };
    Waiter mine{1000, wake}, others{1001, wake};
    std::vector<RequestLine::Place> places;
    const auto take = [&](Waiter& waiter, bool hasUnsent = false) {
        RequestLine::Place place = line.take(waiter, hasUnsent);
        if (place) places.push_back(place);
        return place != nullptr;
    };
    for (int i = 0; i < 4; ++i) EXPECT_TRUE(take(mine)) << "nobody else wants one";
    EXPECT_FALSE(take(mine));
    EXPECT_FALSE(take(others));
    places.pop_back();
    EXPECT_GT(wakeUps, 0);
    EXPECT_FALSE(take(mine)) << "it has its share, and another user waits";
    EXPECT_TRUE(take(others));
    places.erase(places.begin());
    EXPECT_TRUE(take(mine)) << "nobody waits any more";
    EXPECT_FALSE(take(others));
    line.leave(others);
    places.erase(places.begin());
    EXPECT_TRUE(take(mine));
}

TEST(RequestLine, LetsOnlyThoseOnWhoseClientsHaveTakenTheirReplies) {
    RequestLine line({.unsentBytes = 100});
    int wakeUps = 0;
    Waiter waiter{1000, [&] { ++wakeUps; }};
    line.changeUnsent(0, 100);
    EXPECT_FALSE(line.take(waiter, true));
    EXPECT_TRUE(line.take(waiter, false));
    EXPECT_FALSE(line.take(waiter, true));
    line.changeUnsent(100, 99);
    EXPECT_GT(wakeUps, 0);
    EXPECT_TRUE(line.take(waiter, true));
}

}  // namespace
}  // namespace vrx::host
