// What every host tells its process of a change of language or of the paired watches, simulated or real.
#include "contract/hosts.h"
#include "vrx/host/profile/profile_notifier.h"
#include "vrx/platform/vendor.h"

namespace vrx {
namespace {

class SimulatedChanges {
public:
    platform::NotificationCenter& center() { return host_.notifications; }
    platform::Queue& queue() { return host_.queues.mainQueue(); }
    void set(const std::string& language, const std::vector<std::string>& watches) {
        host_.locale.identifier = language;
        host_.watches.all.clear();
        for (const std::string& name : watches) host_.watches.all.push_back({{}, {}, name, {}, true, false});
        host_.tellChanges();
    }
    void start(const std::function<void()>& listen) {
        host_.process.launch([=] {
            listen();
            return std::make_shared<int>();
        });
    }
    void end() { host_.process.kill(); }
    void run() { host_.run(); }

private:
    sim::Host host_;
};

class RealChanges {
public:
    platform::NotificationCenter& center() { return *center_; }
    platform::Queue& queue() { return loop_; }
    void set(const std::string& language, const std::vector<std::string>& watches) {
        std::string text = "locale.language = '" + language + "'\n";
        for (const std::string& name : watches) text += "[[watches]]\nserial_number = '" + name + "'\n";
        host::writeFile(folder_ / "device.toml", text);
        if (notifier_) notifier_->compare();
    }
    void start(const std::function<void()>& listen) {
        center_.emplace();
        notifier_.emplace(profile_, database_, *center_);
        listen();
        notifier_->compare();
    }
    void end() { notifier_.reset(); }
    void run() {
        loop_.post([this] { loop_.stop(); });
        loop_.run();
    }

private:
    host::LogRecorder log_;
    host::TemporaryFolder folder_;
    host::MainLoop loop_;
    host::Database database_{folder_ / "host.db"};
    host::DeviceProfile profile_{folder_ / "device.toml"};
    std::optional<host::NotificationCenter> center_;
    std::optional<host::ProfileNotifier> notifier_;
};

template <class Subject>
class ChangesContract : public testing::Test {
protected:
    void start() {
        subject.start([this] {
            for (const std::string_view name :
                 {platform::languageChangedNotification, platform::devicePairedNotification,
                  platform::deviceUnpairedNotification})
                subject.center().registerForNotification(platform::vendorIdentifier(name), subject.queue(),
                                                         [this, name] { told.emplace_back(name); });
        });
    }
    std::vector<std::string> toldAfter(const std::string& language, const std::vector<std::string>& watches) {
        subject.set(language, watches);
        subject.run();
        return std::exchange(told, {});
    }

    Subject subject;
    std::vector<std::string> told;
};

using Changes = testing::Types<SimulatedChanges, RealChanges>;
TYPED_TEST_SUITE(ChangesContract, Changes, HostNames);

TYPED_TEST(ChangesContract, AreToldOnceToThisProcessOrTheNext) {
    const std::string language = ".language.changed", paired = ".paireddevice.paired",
                      unpaired = ".paireddevice.unpaired";
    this->subject.set("de", {"A"});
    this->start();
    EXPECT_THAT(this->toldAfter("de", {"A"}), IsEmpty());
    EXPECT_THAT(this->toldAfter("fr", {"A", "B"}), ElementsAre(language, paired));
    EXPECT_THAT(this->toldAfter("fr", {"C"}), ElementsAre(paired, unpaired));
    EXPECT_THAT(this->toldAfter("fr", {}), ElementsAre(unpaired));
    this->subject.end();
    EXPECT_THAT(this->toldAfter("es", {"A"}), IsEmpty());
    this->start();
    EXPECT_THAT(this->toldAfter("es", {"A"}), ElementsAre(language, paired));
}

}  // namespace
}  // namespace vrx
