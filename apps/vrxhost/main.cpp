// vrxhost: for testers. Reads the agent's home beside the agent, explains what it finds, changes settings and fires
// activities.
#include "vrxhost/verbs.h"

int main(int argc, char** argv) {
    using namespace vrx::apps;
    CommandLine line("vrxhost", "Looks into the home of a coverage agent, and changes its settings, for testers.");
    vrx::wire::LocationOverrides places;
    line.app().add_option("--home", places.home, "The agent's home")->type_name("PATH");
    addDefaultsVerbs(line, places);
    addUndismissVerb(line, places);
    addCacheVerb(line, places);
    addFollowUpVerbs(line, places);
    addActivitiesVerb(line, places);
    addFireVerb(line, places);
    addWhyVerb(line, places);
    addTimelineVerb(line, places);
    addProfileVerb(line, places);
    addDoctorVerb(line, places);
    addReportVerb(line, places);
    addNotes(line, places);
    return line.run(argc, argv);
}
