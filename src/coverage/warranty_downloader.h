// Fetches devices' coverage records, caches them with their metadata and hands them over. Made for one piece of work
// and kept alive by its downloads, which run side by side; any thread may start one. The process doesn't exit while one
// runs.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/task.h"
#include "vrx/platform/url.h"
#include "vrx/platform/value.h"

namespace vrx {

class VRXWarranty;

class VRXWarrantyDownloader : public std::enable_shared_from_this<VRXWarrantyDownloader> {
public:
    // Success, exactly when there is a record, and the record.
    using Completion = platform::OnceCallback<bool, std::shared_ptr<VRXWarranty>>;

    // On behalf of an application, which is named as the source of the traffic.
    static std::shared_ptr<VRXWarrantyDownloader> initWithCallingProcessBundleID(std::string callingProcessBundleID);

    // Returns at once; completes on a worker. A device without a serial number has no record.
    void downloadWarrantyForSerialNumber(const std::optional<std::string>& serialNumber, Completion completionHandler);

    // The download once the server's version is accepted. Like the next, it may hold its thread while a credential is
    // renewed.
    void _downloadWarrantyForSerialNumber(const std::string& serialNumber, Completion completion);
    // One attempt, and those that follow when the server refuses the credential: as many more as there are retries.
    // Hands over the JSON of an answer with status 200, else null.
    void _downloadWarrantyFromServerURL(const platform::Url& url, const std::string& serialNumber, std::int32_t retries,
                                        platform::OnceCallback<platform::Value> completionBlock);
    // The coverage dictionary of a property-list file: of the serial number's own file beside the URL's when there is
    // one, else of the URL's. Null when neither can be read.
    platform::Value dictionaryFromURL(const platform::Url& url, const std::string& serialNumber) const;

private:
    explicit VRXWarrantyDownloader(std::string callingProcessBundleID)
        : callingProcessBundleID_(std::move(callingProcessBundleID)) {}
    void finish(const std::string& serialNumber, platform::Value coverage, Completion completion) const;

    const std::string callingProcessBundleID_;
};

}  // namespace vrx
