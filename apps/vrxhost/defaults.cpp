// vrxhost defaults: the agent's settings.
#include "vrx/codec/iso_date.h"
#include "vrx/codec/json.h"
#include "vrx/codec/property_list.h"
#include "vrx/platform/known_settings.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Dictionary;
using platform::Result;
using platform::Value;

namespace {

const char* typeName(const Value& value) {
    switch (value.type()) {
        case Value::Type::Null: return "nothing";
        case Value::Type::Bool: return "boolean";
        case Value::Type::Integer: return "integer";
        case Value::Type::Double: return "float";
        case Value::Type::Date: return "date";
        case Value::Type::String: return "string";
        case Value::Type::Data: return "data";
        case Value::Type::Array: return "array";
        case Value::Type::Dictionary: return "dictionary";
    }
    return "";
}

// Where the value in force comes from: "written", a place in the profile, or the agent's own table.
std::string sourceOf(const Home& home, const std::string& key) {
    if (!home.stored().get(key).isNull()) return "written";
    const auto content = home.profile().content();
    const auto place = content->defaultSources.find(key);
    return place == content->defaultSources.end() ? "the agent's own" : place->second;
}

Dictionary settingDocument(const Home& home, const std::string& key, const Value& value) {
    return {{"key", key},
            {"value", value},
            {"type", typeName(value)},
            {"registered", home.stored().get(key).isNull()},
            {"source", sourceOf(home, key)}};
}

Outcome listDefaults(Home& home) {
    platform::Array documents;
    std::vector<std::vector<std::string>> rows{{"KEY", "TYPE", "FROM", "VALUE"}};
    for (const auto& [key, value] : home.defaults().dictionaryRepresentation()) {
        documents.emplace_back(settingDocument(home, key, value));
        rows.push_back({key, typeName(value), sourceOf(home, key), printableValue(value)});
    }
    return {.document = {{"defaults", documents}}, .text = table(rows)};
}

Outcome readDefault(Home& home, const std::string& key) {
    const Value value = home.defaults().get(key);
    if (value.isNull())
        return failed(ExitCode::NoAnswer, "nothing is stored or registered under " + key, "See vrxhost defaults list.");
    return {.document = settingDocument(home, key, value),
            .text = printableValue(value) + "  (" + printable(sourceOf(home, key)) + ")\n"};
}

Outcome storeDefault(Home& home, const std::string& key, const Value& value) {
    if (const platform::MaybeError error = home.defaults().write(key, value))
        return databaseFailure(*error, "not-written");
    return {.document = {{"key", key}, {"value", value}}};
}

// What the agent makes nothing of is stored all the same: another release may read it.
Outcome writeDefault(Home& home, const std::string& key, const Value& value) {
    Outcome outcome = storeDefault(home, key, value);
    const platform::KnownSetting* setting = platform::findSetting(key);
    if (!setting)
        outcome.warnings = {"no part of the agent reads " + key};
    else if (!platform::isReadAs(value, setting->type))
        outcome.warnings = {"the agent ignores a value of this type, " + std::string(typeName(value)) + ": " + key +
                            " is " + std::string(platform::describe(setting->type))};
    if (outcome.code != ExitCode::Done) outcome.warnings.clear();
    if (!outcome.warnings.empty()) outcome.document["warning"] = outcome.warnings.front();
    return outcome;
}

Outcome deleteDefault(Home& home, const std::string& key) {
    const bool wasStored = !home.stored().get(key).isNull();
    Outcome outcome = storeDefault(home, key, nullptr);
    if (outcome.code != ExitCode::Done) return outcome;
    return {.document = {{"key", key}, {"deleted", wasStored}},
            .text = wasStored ? "" : "Nothing was stored under " + printable(key) + ".\n"};
}

struct Setting {
    std::string key;
    Value value;
};

void addKey(CLI::App* verb, Setting& setting) {
    verb->add_option("KEY", setting.key, "The setting's name")->required();
}

// Adds the value's options: a JSON value or one of the typed forms.
void addValue(CLI::App* verb, Setting& setting) {
    CLI::Option_group* group = verb->add_option_group("value", "The value, in one of these forms");
    auto add = [&]<class T>(const char* name, const char* type, const char* help, std::type_identity<T>) {
        group
            ->add_option_function<T>(
                name, [&setting](const T& value) { setting.value = value; }, help)
            ->type_name(type);
    };
    auto json = [&setting](const std::string& text) {
        Result<Value> value = codec::parseJson(text);
        if (!value)
            throw CLI::ValidationError("VALUE",
                                       "no JSON value, " + value.error().text + "; a text is given with --string");
        if (value->isNull()) throw CLI::ValidationError("VALUE", "null cannot be stored; use defaults delete");
        if (const auto bytes = codec::serializePropertyList(*value, platform::PropertyListFormat::Binary); !bytes)
            throw CLI::ValidationError("VALUE", "cannot be stored: " + bytes.error().text);
        setting.value = *value;
    };
    group->add_option_function<std::string>("VALUE", json, "A JSON value")->type_name("JSON");
    add("--string", "TEXT", "A text", std::type_identity<std::string>());
    add("--int", "N", "A whole number", std::type_identity<std::int64_t>());
    add("--float", "X", "A number", std::type_identity<double>());
    add("--bool", "true|false", "A boolean", std::type_identity<bool>());
    auto date = [&setting](const std::string& text) {
        const auto value = codec::dateFromIsoText(text);
        if (!value) throw CLI::ValidationError("--date", "'" + text + "' is no date such as 2026-01-31T12:00:00Z");
        setting.value = *value;
    };
    group->add_option_function<std::string>("--date", date, "A date in UTC: 2026-01-31T12:00:00Z")->type_name("DATE");
    group->require_option(1);
}

}  // namespace

void addDefaultsVerbs(CommandLine& line, const wire::LocationOverrides& places) {
    auto setting = std::make_shared<Setting>();
    CLI::App* group = line.addGroup("defaults", "The agent's settings");
    line.add("list", "Lists all settings, and where each comes from", inHome(places, Access::ReadOnly, listDefaults),
             group);
    addKey(line.add("read", "Shows a setting",
                    inHome(places, Access::ReadOnly, [setting](Home& home) { return readDefault(home, setting->key); }),
                    group),
           *setting);
    CLI::App* write =
        line.add("write", "Stores a setting",
                 inHome(places, Access::ReadWrite,
                        [setting](Home& home) { return writeDefault(home, setting->key, setting->value); }),
                 group);
    addKey(write, *setting);
    addValue(write, *setting);
    addKey(
        line.add("delete", "Removes a stored setting; a registered value holds again",
                 inHome(places, Access::ReadWrite, [setting](Home& home) { return deleteDefault(home, setting->key); }),
                 group),
        *setting);
}

}  // namespace vrx::apps
