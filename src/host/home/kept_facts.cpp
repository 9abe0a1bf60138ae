#include "vrx/host/home/kept_facts.h"

#include "vrx/codec/json.h"
#include "vrx/host/home/stored_facts.h"
#include "vrx/platform/sha256_hash.h"

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

// One document, so that a fact is never kept beside another machine's.
constexpr std::string_view factName = "toldByServices";

Value valueOf(const std::optional<std::string>& text) {
    return text ? Value(*text) : Value();
}

std::optional<std::string> textOf(const Value& value) {
    const std::string* text = value.asString();
    return text ? std::optional(*text) : std::nullopt;
}

Value valueOf(const KnownWatch& watch) {
    return Dictionary{{"address", watch.address},
                      {"adapter", watch.adapter},
                      {"name", watch.name},
                      {"model", valueOf(watch.model)},
                      {"serialNumber", valueOf(watch.serialNumber)},
                      {"pairingDate", platform::epochSeconds(watch.pairingDate)}};
}

KnownWatch watchOf(const Value& value) {
    return {.address = textOf(value["address"]).value_or(""),
            .adapter = textOf(value["adapter"]).value_or(""),
            .name = textOf(value["name"]).value_or(""),
            .model = textOf(value["model"]),
            .serialNumber = textOf(value["serialNumber"]),
            .pairingDate = platform::dateFromEpoch(value["pairingDate"].asNumber().value_or(0))};
}

}  // namespace

ToldFacts keptFacts(Connection& connection, const std::string& machine) {
    ToldFacts facts;
    const auto text = storedFact(connection, factName);
    const platform::Result<Value> document = text ? codec::parseJson(*text) : Value();
    if (!document || (*document)["machine"] != Value(platform::sha256Hash(machine))) return facts;
    facts.serialNumber = textOf((*document)["serialNumber"]);
    facts.language = textOf((*document)["language"]);
    if (const Dictionary* carriers = (*document)["carriers"].asDictionary())
        for (const auto& [service, carrier] : *carriers)
            facts.carriers[service] = {textOf(carrier["mobileCountryCode"]), textOf(carrier["mobileNetworkCode"])};
    if (const Array* watches = (*document)["watches"].asArray())
        for (const Value& watch : *watches) facts.watches.push_back(watchOf(watch));
    return facts;
}

void keepFacts(Connection& connection, const std::string& machine, const ToldFacts& facts) {
    Dictionary carriers;
    for (const auto& [service, carrier] : facts.carriers)
        carriers[service] = Dictionary{{"mobileCountryCode", valueOf(carrier.mobileCountryCode)},
                                       {"mobileNetworkCode", valueOf(carrier.mobileNetworkCode)}};
    Array watches;
    for (const KnownWatch& watch : facts.watches) watches.push_back(valueOf(watch));
    const auto text = codec::serializeJson(Dictionary{{"machine", platform::sha256Hash(machine)},
                                                      {"serialNumber", valueOf(facts.serialNumber)},
                                                      {"language", valueOf(facts.language)},
                                                      {"carriers", carriers},
                                                      {"watches", watches}});
    if (text) setStoredFact(connection, factName, *text);
}

}  // namespace vrx::host
