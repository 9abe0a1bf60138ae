// The verbs of vrxhost, by family. Each function adds one family with its options to the command line. The places hold
// the options of all verbs and must outlive the command line.
#pragma once

#include "common/command_line.h"
#include "vrx/wire/locations.h"

namespace vrx::apps {

void addDefaultsVerbs(CommandLine& line, const wire::LocationOverrides& places);
void addUndismissVerb(CommandLine& line, const wire::LocationOverrides& places);
void addCacheVerb(CommandLine& line, const wire::LocationOverrides& places);
void addFollowUpVerbs(CommandLine& line, const wire::LocationOverrides& places);
void addActivitiesVerb(CommandLine& line, const wire::LocationOverrides& places);
void addFireVerb(CommandLine& line, const wire::LocationOverrides& places);
void addWhyVerb(CommandLine& line, const wire::LocationOverrides& places);
void addTimelineVerb(CommandLine& line, const wire::LocationOverrides& places);
void addProfileVerb(CommandLine& line, const wire::LocationOverrides& places);
void addDoctorVerb(CommandLine& line, const wire::LocationOverrides& places);

void addReportVerb(CommandLine& line, const wire::LocationOverrides& places);
// For the manual page and the completions.
void addNotes(CommandLine& line, const wire::LocationOverrides& places);

}  // namespace vrx::apps
