// How vrxctl shows devices and their records, to programs and to people. One thread.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "vrx/client/agent_connection.h"
#include "vrx/platform/value.h"

namespace vrx::apps {

template <class T>
platform::Value valueOf(const std::optional<T>& value) {
    return value ? platform::Value(*value) : platform::Value();
}

// For programs. A null device gives null.
platform::Value documentOf(const VRXDevice* device);
platform::Dictionary documentOf(const VRXDeviceInfo& info);

// For people: rows of tables, and the lines of a record.
inline const std::vector<std::string> deviceHeading{"NAME", "SERIAL NUMBER", "TYPE", "ACTIVATED"};
inline const std::vector<std::string> coverageHeading{"NAME", "SERIAL NUMBER", "TYPE", "COVERAGE", "OFFER"};
std::vector<std::string> rowOf(const VRXDevice* device);
std::vector<std::string> coverageRow(const VRXDeviceInfo& info);
std::string textOf(const VRXWarranty& record);

// This device first, then the watches by name. Leaves out what is null.
DeviceList inOrder(DeviceList devices);
DeviceInfoList inOrder(DeviceInfoList infos);

// What records derive is to be what the agent's follow-up says. Of an older agent, which does not tell, the shell's
// locale and the usual day serve. Returns what it told.
client::Answer<client::Surroundings> deriveAsAgent(client::AgentConnection& agent);

}  // namespace vrx::apps
