// The coverage records: a folder of JSON files named after serial numbers, read for each request. In a file, a string
// such as "@now", "@now+30d" or "@now-12h:ms" becomes that time as an epoch number, so that examples do not age. Any
// thread may read.
#pragma once

#include <filesystem>
#include <stdexcept>
#include <string>

namespace vrx::coverage_server {

class CoverageRecords {
public:
    // Without a folder, every serial number has the same small record.
    explicit CoverageRecords(std::filesystem::path folder) : folder_(std::move(folder)) {}
    // From SERIAL.json, else from default.json; empty when there is neither. Throws std::runtime_error when the file is
    // not JSON.
    std::string record(const std::string& serialNumber) const;

private:
    const std::filesystem::path folder_;
};

}  // namespace vrx::coverage_server
