#include "host/follow_up_controller.h"

#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include "codec/property_list.h"
#include "host/follow_up_document.h"
#include "support.h"

namespace vrx::host {
namespace {

using platform::Array;
using platform::Data;
using platform::Dictionary;
using platform::FollowUpItem;
using platform::MaybeError;
using platform::Value;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

FollowUpItem item(const std::string& identifier, const std::string& title = "title") {
    return {.uniqueIdentifier = identifier, .title = title, .userInfo = {{"serial", identifier}}};
}

// The service as one process has it.
struct Service {
    explicit Service(const std::string& path, std::chrono::milliseconds busyLimit = std::chrono::seconds(5))
        : database(path, Database::currentSchema, busyLimit) {}

    std::vector<FollowUpItem> pending() const { return controller->pendingFollowUpItems().value(); }
    std::vector<std::string> identifiers() const {
        std::vector<std::string> identifiers;
        for (const FollowUpItem& one : pending()) identifiers.push_back(one.uniqueIdentifier);
        return identifiers;
    }
    void execute(const char* sql) {
        EXPECT_FALSE(database.write([&](Connection& connection) { connection.execute(sql); })) << sql;
    }

    Database database;
    FollowUpControllers controllers{database};
    const std::unique_ptr<platform::FollowUpController> controller = controllers.makeController("client");
};

class FollowUpControllersTest : public ::testing::Test {
protected:
    std::string path() const { return folder / "host.db"; }

    LogRecorder log;
    TemporaryFolder folder;
};

TEST_F(FollowUpControllersTest, AFailureIsAnErrorAndChangesNothing) {
    const std::vector<FollowUpItem> before{item("a", "before"), item("b")};
    {
        Service service(path());
        for (const FollowUpItem& one : before) ASSERT_FALSE(service.controller->postFollowUpItem(one));
    }
    const auto expectError = [&](const MaybeError& error, int code) {
        ASSERT_TRUE(error);
        EXPECT_EQ(error->domain, "database");
        EXPECT_EQ(error->code & 0xff, code) << error->text;
        EXPECT_THAT(error->text, HasSubstr(path()));
    };
    const auto expectFailures = [&](Service& service, int code) {
        const auto& controller = service.controller;
        expectError(controller->postFollowUpItem(item("a", std::string(100'000, 'x'))), code);
        if (code != SQLITE_FULL) expectError(controller->clearPendingFollowUpItems({"b", "a"}), code);
        EXPECT_EQ(service.pending(), before);
        // What changes nothing needs no writing.
        EXPECT_FALSE(controller->postFollowUpItem(before[0]));
        EXPECT_FALSE(controller->clearPendingFollowUpItems({"c"}));
    };
    {
        Service service(path(), std::chrono::milliseconds(10));
        EXPECT_EQ(service.pending(), before);
        Database other(path());
        EXPECT_FALSE(other.write([&](Connection&) { expectFailures(service, SQLITE_BUSY); }));
        EXPECT_FALSE(service.controller->postFollowUpItem(item("a", "after")));
        EXPECT_FALSE(service.controller->postFollowUpItem(before[0]));
    }
    for (auto [fault, code] :
         {std::pair("PRAGMA query_only = 1", SQLITE_READONLY), {"PRAGMA max_page_count = 1", SQLITE_FULL}}) {
        Service service(path());
        service.execute(fault);
        expectFailures(service, code);
    }
    const Service absent(folder / "absent/host.db");
    EXPECT_FALSE(absent.controller->pendingFollowUpItems());
    EXPECT_TRUE(absent.controller->postFollowUpItem(before[0]));
    EXPECT_TRUE(absent.controller->clearPendingFollowUpItems({"a"}));
    Service service(path());
    EXPECT_TRUE(service.controller->postFollowUpItem({.uniqueIdentifier = "c", .userInfo = {{"null", nullptr}}}));
    EXPECT_EQ(service.pending(), before);
}

TEST_F(FollowUpControllersTest, FollowsAFileThatIsReplacedOrRemoved) {
    Service service(path());
    ASSERT_FALSE(service.controller->postFollowUpItem(item("a")));
    {
        const Service other(folder / "other.db");
        ASSERT_FALSE(other.controller->postFollowUpItem(item("b")));
    }
    std::filesystem::rename(folder / "other.db", path());
    EXPECT_THAT(service.identifiers(), ElementsAre("b"));
    EXPECT_FALSE(service.controller->postFollowUpItem(item("a")));
    EXPECT_THAT(Service(path()).identifiers(), ElementsAre("b", "a"));
    std::filesystem::remove(path());
    EXPECT_THAT(service.identifiers(), IsEmpty());
    EXPECT_FALSE(service.controller->postFollowUpItem(item("a")));
    EXPECT_THAT(Service(path()).identifiers(), ElementsAre("a"));
}

TEST_F(FollowUpControllersTest, AnItemThatCannotBeReadHidesNoOther) {
    const auto stored = [](const Value& document) {
        return *codec::serializePropertyList(document, platform::PropertyListFormat::Binary);
    };
    const auto with = [](std::string_view key, const Value& value) {
        Dictionary document = *followUpDocument(item("b")).asDictionary();
        document.insert_or_assign(std::string(key), value);
        return Value(document);
    };
    Service service(path());
    for (const char* identifier : {"a", "b", "c"}) ASSERT_FALSE(service.controller->postFollowUpItem(item(identifier)));
    for (const Data& damaged :
         {Data{}, Data{'x'}, stored("text"), stored(Dictionary{}), stored(with("title", 1)),
          stored(with("userInfo", "")), stored(with("actions", Dictionary{})), stored(with("actions", Array{"act"})),
          stored(with("actions", Array{Dictionary{{"url", true}}})), stored(with("displayStyle", 0.5)),
          stored(with("expirationDate", "soon")), stored(with("more", 1))}) {
        const auto damage = [&] {
            ASSERT_FALSE(service.database.write([&](Connection& connection) {
                connection.statement("UPDATE follow_ups SET item = ? WHERE identifier = 'b'").bind(0, damaged).step();
            }));
            const std::size_t lines = log.lines().size();
            EXPECT_THAT(service.identifiers(), ElementsAre("a", "c"));
            ASSERT_EQ(log.lines().size(), lines + 1);
            EXPECT_THAT(log.lines().back(), HasSubstr("The follow-up b cannot be read: "));
        };
        damage();
        EXPECT_FALSE(service.controller->postFollowUpItem(item("b")));
        EXPECT_THAT(service.identifiers(), ElementsAre("a", "b", "c"));
        damage();
        EXPECT_FALSE(service.controller->clearPendingFollowUpItems({"b", "c"}));
        EXPECT_FALSE(service.controller->postFollowUpItem(item("b")));
        EXPECT_FALSE(service.controller->postFollowUpItem(item("c")));
        EXPECT_THAT(service.identifiers(), ElementsAre("a", "b", "c"));
    }
}

TEST_F(FollowUpControllersTest, ProcessesAtOnceLoseNothingAndSeeEachOther) {
    constexpr int each = 50;
    const auto work = [&](const std::string& name) {
        const Service service(path());
        const auto& controller = service.controller;
        for (int i = 0; i < each; ++i) {
            const std::string own = name + std::to_string(i);
            const bool isDone = !controller->postFollowUpItem(item(own)) &&
                                !controller->postFollowUpItem(item("shared", own)) &&
                                !controller->clearPendingFollowUpItems({name + std::to_string(i - 1), "nobody's"});
            if (!isDone || service.identifiers().size() < 2) return 1;
        }
        return 0;
    };
    const pid_t child = fork();
    if (child == 0) _exit(work("child"));
    EXPECT_EQ(work("parent"), 0);
    int status = -1;
    waitpid(child, &status, 0);
    EXPECT_EQ(status, 0);
    std::vector<std::string> left = Service(path()).identifiers();
    std::sort(left.begin(), left.end());
    EXPECT_THAT(left, ElementsAre("child49", "parent49", "shared"));
}

}  // namespace
}  // namespace vrx::host
