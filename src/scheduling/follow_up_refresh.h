// Has the shown follow-ups brought up to date, from cached records only. It schedules itself for the next moment at
// which a text or the eligibility changes, until none is shown. It has no state; any thread may use it.
#pragma once

#include <memory>
#include <optional>

#include "vrx/platform/date.h"
#include "vrx/scheduling/activity_collaborators.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

class VRXFollowUpRefresh final : public VRXSchedulerActivityDelegate,
                                 public std::enable_shared_from_this<VRXFollowUpRefresh> {
public:
    explicit VRXFollowUpRefresh(ActivityCollaborators collaborators) : collaborators_(std::move(collaborators)) {}

    std::string identifier() const override;
    bool requiresNetwork() const override { return false; }
    // Ends as deferred when no device infos can be loaded, else as finished.
    void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                     CompletionHandler completionHandler) override;

    // The rule of refresh_date.h, with the present settings and time. "DevicesInfo" is spelled so on purpose.
    static std::optional<platform::Date> nextFollowUpRefreshDateWithDevicesInfo(const DeviceInfoList& deviceInfos,
                                                                                bool isInitialCall);

private:
    void refresh(const DeviceInfoList& deviceInfos);

    const ActivityCollaborators collaborators_;
};

}  // namespace vrx
