#include "vrx/followup/serial_number_hashes.h"

#include <algorithm>
#include <utility>

#include "vrx/platform/defaults_store.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/sha256_hash.h"

namespace vrx {

using platform::Array;
using platform::Platform;
using platform::Value;

namespace {

Array listFrom(const Value& stored) {
    const Array* list = stored.asArray();
    return list ? *list : Array();
}

enum class WhenPresent { AppendAgain, LeaveAsIs };

void append(std::string_view key, const Value& hash, WhenPresent whenPresent) {
    Platform::current().defaultsStore().update(key, [&](const Value& stored) -> Value {
        Array list = listFrom(stored);
        // Another thread or process may have added the hash meanwhile.
        if (whenPresent == WhenPresent::LeaveAsIs && std::ranges::find(list, hash) != list.end()) return stored;
        list.push_back(hash);
        return list;
    });
}

}  // namespace

std::set<std::string> serialNumberHashes(std::string_view key) {
    std::set<std::string> hashes;
    for (const Value& element : listFrom(Platform::current().defaultsStore().get(key)))
        if (const std::string* hash = element.asString()) hashes.insert(*hash);
    return hashes;
}

void appendSerialNumberHash(std::string_view key, const std::string& serialNumber) {
    append(key, platform::sha256Hash(serialNumber), WhenPresent::AppendAgain);
}

void appendMissingSerialNumberHash(std::string_view key, const std::string& serialNumber) {
    const std::string hash = platform::sha256Hash(serialNumber);
    if (serialNumberHashes(key).contains(hash)) return;  // the usual case, in which nothing is written
    append(key, hash, WhenPresent::LeaveAsIs);
}

}  // namespace vrx
