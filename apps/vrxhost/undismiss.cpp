// vrxhost undismiss: takes back that a device's follow-up was dismissed for good.
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/platform/sha256_hash.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Array;
using platform::Value;

namespace {

// Beside a running agent, which may dismiss another one meanwhile: the list is changed in one step.
Outcome undismiss(Home& home, const std::string& serialNumber) {
    const Value hash = platform::sha256Hash(serialNumber);
    bool wasDismissed = false;
    if (serialNumberHashes(dismissedSerialNumberHashesKey).contains(*hash.asString()))
        if (const platform::MaybeError error =
                home.defaults().rewrite(dismissedSerialNumberHashesKey, [&](const Value& stored) -> Value {
                    if (!stored.asArray()) return stored;
                    Array hashes = *stored.asArray();
                    wasDismissed = std::erase(hashes, hash) > 0;
                    return hashes;
                }))
            return databaseFailure(*error, "not-written");
    return {.document = {{"serialNumber", serialNumber}, {"undismissed", wasDismissed}},
            .text = wasDismissed ? "The follow-up of " + printable(serialNumber) +
                                       " may be shown again: vrxhost why tells when.\n"
                                 : "The follow-up of " + printable(serialNumber) + " was not dismissed.\n"};
}

}  // namespace

void addUndismissVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto serialNumber = std::make_shared<std::string>();
    line.add("undismiss", "Takes back that the follow-up of a device was dismissed",
             inHome(places, Access::ReadWrite, [=](Home& home) { return undismiss(home, *serialNumber); }))
        ->add_option("SERIAL", *serialNumber, "The serial number")
        ->required();
}

}  // namespace vrx::apps
