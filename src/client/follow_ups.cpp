#include "vrx/client/follow_ups.h"

#include "vrx/client/caller.h"

namespace vrx::client {

using platform::Array;
using platform::Value;

namespace {

std::optional<std::string> textIn(const Value& document, const char* key) {
    const std::string* text = document[key].asString();
    return text ? std::optional(*text) : std::nullopt;
}

std::optional<FollowUp> followUpFrom(const Value& document) {
    const auto identifier = textIn(document, "identifier");
    if (!identifier) return std::nullopt;
    FollowUp followUp{.identifier = *identifier,
                      .serialNumber = textIn(document, "serialNumber"),
                      .deviceName = textIn(document, "deviceName"),
                      .title = textIn(document, "title"),
                      .text = textIn(document, "text"),
                      .hasBadge = document["badge"].asBool().value_or(false),
                      .daysLeft = document["daysLeft"].asInteger(),
                      .nextTextChange = document["nextTextChange"].asDate(),
                      .expirationDate = document["expirationDate"].asDate(),
                      .item = document["item"]};
    if (const Array* actions = document["actions"].asArray())
        for (const Value& action : *actions)
            followUp.actions.push_back({textIn(action, "label"), textIn(action, "url")});
    return followUp;
}

}  // namespace

template <>
struct Decoder<std::vector<FollowUp>> {
    static Answer<std::vector<FollowUp>> decode(const Value& root) {
        using enum platform::AllowedKinds::Kind;
        const auto list = codec::unarchiveValue(root, {Dictionaries, Arrays, Strings, Numbers, Dates});
        if (!list) return badReply(list.error().text);
        if (!list->asArray()) return badReply("the agent could not list the follow-ups");
        std::vector<FollowUp> followUps;
        for (const Value& document : *list->asArray())
            if (std::optional<FollowUp> followUp = followUpFrom(document)) followUps.push_back(*std::move(followUp));
        return followUps;
    }
};

FollowUps::FollowUps(ConnectionOptions options) : caller_(std::make_unique<Caller>(std::move(options))) {}

FollowUps::~FollowUps() = default;

Answer<std::vector<FollowUp>> FollowUps::pending() {
    return caller_->call<std::vector<FollowUp>>(wire::followUpsInterface, wire::pendingFollowUpsOperation);
}

Call FollowUps::pending(Callback<std::vector<FollowUp>> callback) {
    return caller_->callLater(wire::followUpsInterface, wire::pendingFollowUpsOperation, std::move(callback));
}

Answer<bool> FollowUps::dismiss(const std::string& identifier) {
    return caller_->call<bool>(wire::followUpsInterface, wire::dismissFollowUpOperation, {.text = identifier});
}

Call FollowUps::dismiss(std::string identifier, Callback<bool> callback) {
    return caller_->callLater(wire::followUpsInterface, wire::dismissFollowUpOperation, std::move(callback),
                              std::move(identifier));
}

}  // namespace vrx::client
