#include "vrx/host/home/follow_up_document.h"

#include <algorithm>
#include <stdexcept>

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::FollowUpAction;
using platform::FollowUpItem;
using platform::Result;
using platform::Value;

namespace {

constexpr std::string_view uniqueIdentifierKey = "uniqueIdentifier";
constexpr std::string_view groupIdentifierKey = "groupIdentifier";
constexpr std::string_view targetBundleIdentifierKey = "targetBundleIdentifier";
constexpr std::string_view extensionIdentifierKey = "extensionIdentifier";
constexpr std::string_view displayStyleKey = "displayStyle";
constexpr std::string_view titleKey = "title";
constexpr std::string_view informativeFooterTextKey = "informativeFooterText";
constexpr std::string_view expirationDateKey = "expirationDate";
constexpr std::string_view userInfoKey = "userInfo";
constexpr std::string_view actionsKey = "actions";
constexpr std::string_view labelKey = "label";
constexpr std::string_view urlKey = "url";

void add(Dictionary& document, std::string_view key, const std::optional<std::string>& text) {
    if (text) document.emplace(key, *text);
}

// Carries the first mistake out of a document.
class Mistake : public std::runtime_error {
    using std::runtime_error::runtime_error;
};

// The entries of a dictionary, read by type. Absent and null entries read as nothing.
class Entries {
public:
    Entries(const Value& value, const std::string& what, std::initializer_list<std::string_view> keys) : value_(value) {
        if (!value.asDictionary()) throw Mistake(what + " is no dictionary");
        for (const auto& [key, entry] : *value.asDictionary())
            if (std::find(keys.begin(), keys.end(), key) == keys.end()) throw Mistake(what + " has no \"" + key + '"');
    }

    std::optional<std::string> text(std::string_view key) const {
        if (const std::string* text = value_[key].asString()) return *text;
        return absent(key, "text");
    }
    std::optional<std::int64_t> integer(std::string_view key) const {
        if (const auto integer = value_[key].asInteger()) return *integer;
        return absent(key, "whole number");
    }
    std::optional<double> number(std::string_view key) const {
        if (const auto number = value_[key].asNumber()) return *number;
        return absent(key, "number of seconds");
    }
    const Dictionary* dictionary(std::string_view key) const {
        if (const Dictionary* dictionary = value_[key].asDictionary()) return dictionary;
        absent(key, "dictionary");
        return nullptr;
    }
    const Array* array(std::string_view key) const {
        if (const Array* array = value_[key].asArray()) return array;
        absent(key, "list");
        return nullptr;
    }

private:
    std::nullopt_t absent(std::string_view key, const std::string& wanted) const {
        if (!value_[key].isNull()) throw Mistake('"' + std::string(key) + "\" is no " + wanted);
        return std::nullopt;
    }

    const Value& value_;
};

FollowUpAction actionFrom(const Value& value) {
    const Entries entries(value, "an action", {labelKey, urlKey});
    return {.label = entries.text(labelKey), .url = entries.text(urlKey)};
}

FollowUpItem itemFrom(const Value& document) {
    const Entries entries(
        document, "a follow-up item",
        {uniqueIdentifierKey, groupIdentifierKey, targetBundleIdentifierKey, extensionIdentifierKey, displayStyleKey,
         titleKey, informativeFooterTextKey, expirationDateKey, userInfoKey, actionsKey});
    FollowUpItem item;
    const auto uniqueIdentifier = entries.text(uniqueIdentifierKey);
    if (!uniqueIdentifier) throw Mistake("a follow-up item needs a \"uniqueIdentifier\"");
    item.uniqueIdentifier = *uniqueIdentifier;
    item.groupIdentifier = entries.text(groupIdentifierKey);
    item.targetBundleIdentifier = entries.text(targetBundleIdentifierKey);
    item.extensionIdentifier = entries.text(extensionIdentifierKey);
    item.displayStyle = static_cast<std::uint64_t>(entries.integer(displayStyleKey).value_or(0));
    item.title = entries.text(titleKey);
    item.informativeFooterText = entries.text(informativeFooterTextKey);
    if (const auto seconds = entries.number(expirationDateKey)) item.expirationDate = platform::dateFromEpoch(*seconds);
    if (const Dictionary* userInfo = entries.dictionary(userInfoKey)) item.userInfo = *userInfo;
    if (const Array* actions = entries.array(actionsKey))
        std::transform(actions->begin(), actions->end(), std::back_inserter(item.actions), actionFrom);
    return item;
}

}  // namespace

Value followUpDocument(const FollowUpItem& item) {
    Dictionary document{{std::string(uniqueIdentifierKey), item.uniqueIdentifier},
                        {std::string(displayStyleKey), static_cast<std::int64_t>(item.displayStyle)},
                        {std::string(userInfoKey), item.userInfo}};
    add(document, groupIdentifierKey, item.groupIdentifier);
    add(document, targetBundleIdentifierKey, item.targetBundleIdentifier);
    add(document, extensionIdentifierKey, item.extensionIdentifier);
    add(document, titleKey, item.title);
    add(document, informativeFooterTextKey, item.informativeFooterText);
    if (item.expirationDate) document.emplace(expirationDateKey, platform::epochSeconds(*item.expirationDate));
    Array actions;
    for (const FollowUpAction& action : item.actions) {
        Dictionary entry;
        add(entry, labelKey, action.label);
        add(entry, urlKey, action.url);
        actions.emplace_back(std::move(entry));
    }
    document.emplace(actionsKey, std::move(actions));
    return document;
}

Result<FollowUpItem> followUpFromDocument(const Value& document) {
    try {
        return itemFrom(document);
    } catch (const Mistake& mistake) {
        return Error{platform::error_domain::followUp, 0, mistake.what()};
    }
}

}  // namespace vrx::host
