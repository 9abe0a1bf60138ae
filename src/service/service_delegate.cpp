#include "vrx/service/service_delegate.h"

#include <array>
#include <string>

#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/utf8.h"
#include "vrx/platform/vendor.h"
#include "vrx/service/agent.h"

namespace vrx {

using platform::Bundle;
using platform::Level;
using platform::Platform;

namespace {
constexpr std::size_t callerPathBytes = 4096;
}

bool ServiceDelegate::shouldAcceptNewConnection(platform::ServiceListener& /*listener*/,
                                                platform::ServiceConnection& connection) {
    const std::string entitlement = platform::vendorIdentifier(platform::entitlementRemainder);
    // Only the boolean counts: a string or number that looks true is a mistake in the caller's bundle.
    if (!connection.valueForEntitlement(entitlement).asBool().value_or(false)) {
        log(Level::Error, "Rejecting connection to vrxagent: missing entitlement '%@'", entitlement);
        return false;
    }
    std::int32_t processIdentifier = connection.processIdentifier();
    std::optional<Bundle> bundle = _bundleForPID(processIdentifier);
    std::optional<std::string> bundleIdentifier = bundle ? bundle->identifier : std::nullopt;
    log(Level::Default, "connection added from %d with calling process: %@", processIdentifier, bundleIdentifier);
    connection.setExportedInterface(VRXAgentProtocol::protocolName);
    connection.setExportedObject(VRXAgent::initWithCallingProcessBundleID(bundleIdentifier, collaborators_));
    connection.resume();
    return true;
}

std::optional<Bundle> ServiceDelegate::_bundleForPID(std::int32_t processIdentifier) const {
    std::array<char, callerPathBytes> buffer;
    std::size_t length = Platform::current().bundleLookup().executablePath(processIdentifier, buffer);
    const std::string path(buffer.data(), length);
    if (path.empty() || !platform::isUtf8(path)) return std::nullopt;  // such a path makes no URL
    return Platform::current().bundleLookup().bundleContaining(path);
}

}  // namespace vrx
