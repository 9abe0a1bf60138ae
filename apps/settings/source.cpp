#include "settings/source.h"

#include <mutex>
#include <optional>
#include <utility>

#include "vrx/client/agent_connection.h"
#include "vrx/client/changes.h"
#include "vrx/devices/records/device_info.h"

namespace vrx::settings {

using client::Answer;
using platform::Value;

namespace {

// The answers of one round, which come on several threads.
class Round {
public:
    explicit Round(std::function<void(Findings)> done) : done_(std::move(done)) {}

    template <class T>
    std::function<void(Answer<T>)> place(std::optional<Answer<T>> Round::*member, const std::shared_ptr<Round>& self) {
        return [self, member](Answer<T> answer) { self->put(member, std::move(answer)); };
    }

    std::optional<Answer<DeviceList>> paired{};
    std::optional<Answer<DeviceInfoList>> infos{};
    std::optional<Answer<std::vector<client::FollowUp>>> followUps{};
    std::optional<Answer<Value>> status{};

private:
    template <class T>
    void put(std::optional<Answer<T>> Round::*member, Answer<T> answer) {
        {
            std::lock_guard lock(mutex_);
            (this->*member).emplace(std::move(answer));
            if (!paired || !infos || !followUps || !status) return;
        }
        done_(Findings{*std::move(paired), *std::move(infos), *std::move(followUps), *std::move(status)});
    }

    std::mutex mutex_;
    const std::function<void(Findings)> done_;
};

bool isComplete(const DeviceInfoList& infos) {
    for (const auto& info : infos)
        if (!info || !info->warranty()) return false;
    return true;
}

}  // namespace

class Source::Rounds : public std::enable_shared_from_this<Rounds> {
public:
    Rounds(Post post, Page page, Situation known)
        : post_(std::move(post)), page_(std::move(page)), situation_(std::move(known)) {}

    // What the changes call needs a weak pointer to this.
    void begin() {
        changes_.emplace([this, weak = weak_from_this()](const client::Change&) { later(weak, &Rounds::look); });
        look();
    }

    // The agent's threads stop before what their answers use.
    void end() {
        changes_.reset();
        agent_.reset();
        followUps_.reset();
    }

    // At most one round is under way; what changes meanwhile takes another.
    void look() {
        if (std::exchange(isLooking_, true)) {
            isAnotherDue_ = true;
            return;
        }
        isAnotherDue_ = false;
        const auto round = std::make_shared<Round>([this, weak = weak_from_this()](Findings findings) {
            later(weak, &Rounds::looked, std::make_shared<const Findings>(std::move(findings)));
        });
        agent_->pairedDevices(round->place(&Round::paired, round));
        agent_->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyCachedOnly, false,
                                             round->place(&Round::infos, round));
        followUps_->pending(round->place(&Round::followUps, round));
        agent_->status(round->place(&Round::status, round));
    }

    void refresh() {
        if (std::exchange(isRefreshing_, true)) return;
        page_.progress(true);
        agent_->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyRefresh, false,
                                             [this, weak = weak_from_this()](const Answer<DeviceInfoList>& infos) {
                                                 later(weak, &Rounds::downloaded, infos && isComplete(*infos));
                                             });
    }

    void dismiss(const std::string& identifier) {
        followUps_->dismiss(identifier, [this, weak = weak_from_this()](const Answer<bool>& answer) {
            later(weak, &Rounds::dismissed, answer && *answer);
        });
    }

    const std::string& socketPath() const { return agent_->socketPath(); }

private:
    // Any thread. Nothing is done when the page is gone.
    template <class... Arguments, class... Given>
    void later(const std::weak_ptr<Rounds>& weak, void (Rounds::*step)(Arguments...), Given... given) const {
        post_([weak, step, given...] {
            if (const auto self = weak.lock(); self && self->agent_) (self.get()->*step)(given...);
        });
    }

    void looked(std::shared_ptr<const Findings> findings) {
        situation_ = situationAfter(situation_, *findings);
        isLooking_ = false;
        page_.show(situation_);
        if (isAnotherDue_) look();
    }

    void downloaded(bool isComplete) {
        if (!isComplete) return refreshed(false);
        agent_->getAllDeviceInfosUsingPolicy(
            VRXWarrantyLookupPolicyCachedOnly, true,
            [this, weak = weak_from_this()](const Answer<DeviceInfoList>&) { later(weak, &Rounds::refreshed, true); });
    }

    void refreshed(bool isComplete) {
        isRefreshing_ = false;
        page_.progress(false);
        page_.refreshed(isComplete);
        look();
    }

    void dismissed(bool isDismissed) {
        page_.dismissed(isDismissed);
        look();
    }

    const Post post_;
    const Page page_;
    Situation situation_;
    bool isLooking_ = false, isAnotherDue_ = false, isRefreshing_ = false;
    std::optional<client::AgentConnection> agent_{std::in_place};
    std::optional<client::FollowUps> followUps_{std::in_place};
    std::optional<client::Changes> changes_;
};

Source::Source(Post post, Page page, Situation known)
    : rounds_(std::make_shared<Rounds>(std::move(post), std::move(page), std::move(known))) {
    rounds_->begin();
}

Source::~Source() {
    rounds_->end();
}

void Source::look() {
    rounds_->look();
}

void Source::refresh() {
    rounds_->refresh();
}

void Source::dismiss(const std::string& identifier) {
    rounds_->dismiss(identifier);
}

const std::string& Source::socketPath() const {
    return rounds_->socketPath();
}

}  // namespace vrx::settings
