// The coverage records: a folder of JSON files named after serial numbers, read afresh for each request. In a file, a
// string such as "@now", "@now+30d" or "@now-12h:ms" stands for that time as an epoch number, so that examples do not
// age. Any thread may read.
#pragma once

#include <filesystem>
#include <stdexcept>
#include <string>

namespace vrx::coverage_server {

class CoverageRecords {
public:
    // Without a folder every serial number has one small record.
    explicit CoverageRecords(std::filesystem::path folder) : folder_(std::move(folder)) {}
    // SERIAL.json, else default.json; empty when there is neither. Throws std::runtime_error for a file that is not
    // JSON.
    std::string record(const std::string& serialNumber) const;

private:
    const std::filesystem::path folder_;
};

}  // namespace vrx::coverage_server
