// Fetches devices' coverage records, caches them with their metadata and completes with them. Made for one piece of
// work and kept alive by its downloads, which run side by side. Any thread may start one. The process does not exit
// while one runs.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
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
    // Success and the record; success is true exactly when there is a record.
    using Completion = platform::OnceCallback<bool, std::shared_ptr<VRXWarranty>>;

    // Downloads on behalf of an application, which the requests name as the source of the traffic.
    static std::shared_ptr<VRXWarrantyDownloader> initWithCallingProcessBundleID(std::string callingProcessBundleID);

    // Returns at once; completes on a worker. A device without a serial number has no record.
    void downloadWarrantyForSerialNumber(const std::optional<std::string>& serialNumber, Completion completionHandler);

    // The download after the server's version was accepted. This operation and the next may block their thread while a
    // credential is renewed.
    void _downloadWarrantyForSerialNumber(const std::string& serialNumber, Completion completion);
    // Makes one attempt and, as long as the server refuses the credential, as many more as there are retries. Completes
    // with the JSON of an answer with status 200, else with null.
    void _downloadWarrantyFromServerURL(const platform::Url& url, const std::string& serialNumber, std::int32_t retries,
                                        platform::OnceCallback<platform::Value> completionBlock);
    // The coverage dictionary in a property-list file: in the serial number's own file beside the URL's, or else in the
    // URL's file. Null when neither can be read.
    platform::Value dictionaryFromURL(const platform::Url& url, const std::string& serialNumber) const;

private:
    explicit VRXWarrantyDownloader(std::string callingProcessBundleID)
        : callingProcessBundleID_(std::move(callingProcessBundleID)) {}
    void finish(const std::string& serialNumber, platform::Value coverage, Completion completion) const;

    const std::string callingProcessBundleID_;
};

}  // namespace vrx
