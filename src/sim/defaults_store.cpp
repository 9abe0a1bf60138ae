#include "vrx/sim/defaults_store.h"

#include <cerrno>
#include <utility>

#include "vrx/codec/property_list.h"
#include "vrx/platform/log.h"

namespace vrx::sim {

using platform::Dictionary;
using platform::Error;
using platform::MaybeError;
using platform::Value;

Value DefaultsStore::get(std::string_view key) const {
    checkOutsideUpdate();
    betweenCalls_.call();
    const bool isStale = before_ && betweenCalls_.strikes(Defect::SettingStale);
    for (const Dictionary* layer : {isStale ? &*before_ : &stored_, &registered_})
        if (auto entry = layer->find(key); entry != layer->end()) return entry->second;
    return {};
}

void DefaultsStore::set(std::string_view key, Value value) {
    checkOutsideUpdate();
    betweenCalls_.call();
    writes_.emplace_back(key);
    if (MaybeError error = writeError(value))
        platform::log(platform::Level::Error, "Cannot write the setting %@: %@", key, *error);
    else
        write(key, std::move(value));
}

MaybeError DefaultsStore::writeError(const Value& value) {
    if (failingWrites_ > 0) {
        --failingWrites_;
        return Error{platform::error_domain::system, ENOSPC, "no space left"};
    }
    if (value.isNull() || value.isNumber() || value.asString()) return std::nullopt;
    auto stored = codec::serializePropertyList(value, platform::PropertyListFormat::Binary);
    return stored ? std::nullopt : MaybeError(stored.error());
}

void DefaultsStore::write(std::string_view key, Value value) {
    if (betweenCalls_.strikes(Defect::SettingLost)) return;
    const Defect planted = betweenCalls_.planted;
    if (planted == Defect::SettingStale || planted == Defect::SettingForgotten) before_ = stored_;
    if (!value.isNull())
        stored_.insert_or_assign(std::string(key), std::move(value));
    else if (auto entry = stored_.find(key); entry != stored_.end())
        stored_.erase(entry);
}

void DefaultsStore::update(std::string_view key, const std::function<Value(const Value&)>& change) {
    auto changed = [&] {
        Value present = get(key);
        isUpdating_ = true;
        Value value = change(present);
        isUpdating_ = false;
        return value;
    };
    Value value = changed();
    if (interference_) {
        write(key, *std::exchange(interference_, std::nullopt));
        value = changed();
    }
    set(key, std::move(value));
}

void DefaultsStore::forgetRegistered() {
    registered_.clear();
    if (before_ && betweenCalls_.strikes(Defect::SettingForgotten)) stored_ = *before_;
}

void DefaultsStore::registerDefaults(const Dictionary& values) {
    checkOutsideUpdate();
    for (const auto& [key, value] : values) registered_.insert_or_assign(key, value);
}

Dictionary DefaultsStore::dictionaryRepresentation() const {
    checkOutsideUpdate();
    Dictionary all = stored_;
    all.insert(registered_.begin(), registered_.end());
    return all;
}

void DefaultsStore::checkOutsideUpdate() const {
    if (isUpdating_) failures_.report("the function of an update used the settings");
}

}  // namespace vrx::sim
