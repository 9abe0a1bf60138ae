// What the agent's rules give, as a model of its own: it hears what ran, what was looked up and what the servers
// answered, and says from that which items are posted, updated and removed, and with which texts. It shares no code
// with the agent. What the agent does otherwise breaks the rule `as-the-rules`.
//
// A reply may have two possible records where lookups of one device overlap and one of them fails; then either will do.
// Runs themselves are taken as they come: whether one is missing, the differences from what is wished for tell.
#pragma once

#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "vrxsim/verdict.h"
#include "vrxsim/world.h"

namespace vrx::simulation {

// What a lookup replied: an answer of the server by its number, or none and why.
struct Found {
    enum class Lack { None, NeverAnswered, Failed, SignedOut, OtherLanguage, Unreadable, NotKept };
    int answer = 0;
    Lack lack = Lack::None;

    bool isRecord() const { return lack == Lack::None; }
    bool operator==(const Found&) const = default;
};

struct ShownItem {
    int answer = 0;
    double filledAt = 0;  // elapsed seconds
    std::string title{}, footer{};
    bool isFromOlderLayout = false;  // it was migrated
    bool hasRequestFailed = false;   // the service refused the last update or clear
    bool isRunCutShort = false;      // the process ended right after it was filled
};

struct Removal {
    enum class Cause { NoRecord, NoOffer, Ended, Unpaired, Unsupported, Dismissed };
    double at = 0;
    Cause cause = Cause::NoRecord;
    Found found{};
    platform::Duration clockOffset{0};  // then
};

// What the last run that plans posts knew of a device: an outreach, a post or the refresh after a pairing.
struct PlannersView {
    enum class Run { Outreach, Post, Pairing };
    double at = 0;
    Run run = Run::Outreach;
    Found found{};
    bool isExcluded = false;       // by its carrier; asked by outreaches only
    bool isDismissed = false;      // so it is not posted
    bool wasPosted = false;        // before, so it gets no date
    bool isDue = false;            // now
    bool isDateTakenAway = false;  // by another device's offer without an end
    bool wasRefused = false;       // the service took no item
};

struct Download {
    int answer = 0;
    double at = 0;
};

// A device when the next refresh was planned.
struct RefreshView {
    double at = 0;
    Found found{};
    double daysLeft = 0;
    bool isDisplayAhead = false;
    bool hasNoActivation = false;
};

class Rules {
public:
    Rules(World& world, Verdict& verdict);
    ~Rules() { turnOff(); }
    Rules(const Rules&) = delete;
    Rules& operator=(const Rules&) = delete;

    // For a play that is not judged: hears nothing from now on.
    void turnOff();
    // To be called before the process is killed.
    void processEnds();
    void dismissalIsAsked(const std::string& serialNumber) { ++dismissals_[serialNumber]; }
    // A client has its reply: no refresh belongs to what was looked up for it any more.
    void replyArrives() { armed_ = Armed::Nothing; }
    // To be called after each event, and now and then: reports what was found since, and compares what is shown.
    void check();
    // Called before what is known changes.
    std::function<void()> beforeChange = [] {};

    const std::map<std::string, ShownItem>& items() const { return items_; }
    const Removal* removal(const std::string& serialNumber) const { return entry(removals_, serialNumber); }
    const PlannersView* planned(const std::string& serialNumber) const { return entry(planned_, serialNumber); }
    const RefreshView* refreshed(const std::string& serialNumber) const { return entry(refreshed_, serialNumber); }
    // The answer with a number that was last downloaded for a device; null before.
    const Download* downloaded(const std::string& serialNumber) const { return entry(downloaded_, serialNumber); }
    // When a list of all devices last lacked a watch that was paired; null for never.
    const double* leftOutAt(const std::string& serialNumber) const { return entry(leftOut_, serialNumber); }
    // Whether the cached file is older than what was last downloaded, which a failed write leaves behind.
    bool isCacheBehind(const std::string& serialNumber) const;
    bool isDismissalStored(const std::string& serialNumber) const;
    double lastOutreachAt() const { return lastOutreachAt_; }  // below 0: none has ended
    // Whether the process ended before it had looked after a pairing or unpairing at that second of its life. Of what
    // was paired at the beginning no process is told.
    bool wasPairingCutShort(double at) const { return at > 0 && lastPairingPlansAt_ < at && processEndedAt_ >= at; }
    // Whether the process ended right after it had turned to the next post, or refresh, which can lose it.
    bool wasPostPlanCutShort() const { return postPlan_.isCutShort; }
    bool wasRefreshPlanCutShort() const { return refreshPlan_.isCutShort; }
    double listingFailedAt() const { return listingFailedAt_; }  // of a refresh; below 0: never
    // Why no refresh is planned any more although an item is left: none was seen, for a listing failed, or it was to be
    // cleared, which was refused.
    enum class EndOfRefreshes { None, FailedListing, RefusedClear };
    EndOfRefreshes endOfRefreshes() const { return endOfRefreshes_; }
    platform::Duration outreachDelay() const;
    std::optional<platform::Date> activation(const std::string& serialNumber) const;

    // The number that a text spells, in whichever digits; 0 without any.
    static int numberIn(std::string_view text);

private:
    struct Lookup {
        std::string serialNumber{};
        std::uint64_t policy = 0;
        Found cached{};
        bool mayReadFail = false;
        bool isDownloading = false;
    };
    // A device of a list, with what its lookup may have replied.
    struct Listed {
        std::string serialNumber{};
        std::optional<platform::Date> activation{};
        std::vector<Found> found{};
    };
    enum class Armed { Nothing, Single, List };
    // What a piece of work may and must ask of the follow-up service.
    struct Posting {
        std::string serialNumber{};
        std::vector<int> answers{};
        bool isMust = false;
    };
    struct Work {
        std::set<std::string> mustClear, mayClear;  // identifiers
        std::vector<Posting> posts;
    };

    template <class T>
    static const T* entry(const std::map<std::string, T>& map, const std::string& key) {
        const auto found = map.find(key);
        return found == map.end() ? nullptr : &found->second;
    }

    void hear(const platform::LogEntry& line);
    void hear(const sim::FollowUpControllers::Answered& answered);
    struct Plan {
        double at = -secondsOfDay;
        bool isCutShort = false;
    };

    void forgetWork();
    void disagree(const std::string& text);

    void lookupBegins(const std::string& serialNumber, std::uint64_t policy);
    void cacheIsEmpty();
    void lookupDecided(bool isDownloading);
    void lookupEnds(const std::string& serialNumber, bool isDownloaded);
    void downloads(const std::string& text);
    void listEnds(const std::string& text);
    void postBegins();
    void pairingPlans();
    void outreachLooks(const std::string& serialNumber, bool isDownloaded);
    void outreachEnds();
    void refreshIsPlanned(bool isForAll);

    std::optional<std::string> cachedFile(const std::string& serialNumber) const;
    void noteLeftOut(const std::vector<std::string>& listed);
    Found cachedRecord(const std::string& serialNumber) const;
    Found failedLook(const Lookup& lookup) const;
    void refreshBegins(bool isWhole, bool isListed);
    void refreshesEnd() { endOfRefreshes_ = endByLastRefresh_; }
    void finishWork();
    void posted(const platform::FollowUpItem& item, bool isDone);
    void cleared(const std::vector<std::string>& identifiers, bool isDone);
    void remove(const std::string& identifier);
    std::optional<Removal::Cause> causeOfRemoval(const Found& found) const;
    bool isDue(const Listed& device, const Found& found, platform::Duration tolerance) const;
    bool isListed(const std::string& key, const std::string& serialNumber) const;
    enum class WithoutEnd : bool { Counts, IsLeftOut };
    std::optional<platform::Date> nextPost(bool areDueOnesPosted, WithoutEnd withoutEnd) const;
    void postIsPlanned(const std::string& date);
    void noteSupport();
    bool wasUnsupported() const;
    PlannersView viewOf(const Listed& device, PlannersView::Run run) const;
    std::string differenceFrom(const platform::FollowUpItem& item, int answer) const;
    const std::string& identifierOf(const std::string& serialNumber);
    std::string deviceOf(const std::string& identifier) const;

    World& world_;
    Verdict& verdict_;
    std::optional<std::string> disagreement_;

    std::map<std::string, std::string> identifiers_;  // by serial number
    std::map<std::string, ShownItem> items_;
    std::map<std::string, Removal> removals_;
    std::map<std::string, Removal> toRemove_;  // by the piece of work under way
    std::map<std::string, PlannersView> planned_;
    std::map<std::string, RefreshView> refreshed_;
    std::map<std::string, Download> downloaded_;
    std::map<std::string, double> leftOut_;
    std::map<std::string, int> dismissals_;  // asked for
    std::vector<PlannersView> outreach_;     // the run under way, with the devices in
    std::vector<std::string> outreachDevices_;
    double lastOutreachAt_ = -1, lastPairingPlansAt_ = -1, processEndedAt_ = -1, listingFailedAt_ = -1;
    Plan postPlan_, refreshPlan_;
    double unsupportedAt_ = -1;  // when watches were last left out for the flag or the server's version

    Lookup asked_;
    int lastDownloaded_ = 0;
    // The lookups of a device that download, from the first one until none is left. Which of them ends is not known.
    struct Downloads {
        std::vector<Lookup> lookups{};
        int running = 0;
    };
    std::map<std::string, Downloads> downloading_;
    int downloadingCount_ = 0;
    EndOfRefreshes endByLastRefresh_ = EndOfRefreshes::None;  // if it should turn out to be the last of all
    EndOfRefreshes endOfRefreshes_ = EndOfRefreshes::None;
    double lastLookupAt_ = 0;
    std::map<std::string, std::vector<Found>> found_;  // since nothing was under way
    std::vector<Found> lastFound_;
    std::string lastSerialNumber_;
    std::vector<Listed> list_;
    Armed armed_ = Armed::Nothing;
    bool isMigrating_ = false;
    std::optional<Work> work_;
};

}  // namespace vrx::simulation
