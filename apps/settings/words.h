// What the page says in its own words, in the user's language, beside what the server sent. Any thread.
#pragma once

#include <string>

#include "settings/model.h"

namespace vrx::settings {

// Has the texts translated: from the folder beside the program, where a build leaves them, else from the system's.
void useTranslations();

// The translation of a text, which is the key as well.
const char* tr(const char* text);

// A text with the first "%s" in it replaced. Translators move it.
std::string with(const char* format, const std::string& text);

// A day in the long form of the user's locale.
std::string dayText(platform::Date date);

// "Covered until June 30, 2030", "Not covered", "No coverage information".
std::string coverageText(const Device& device);
std::string nameOf(const Device& device);

// What stands in the place of the page when there is nothing else to show.
struct Status {
    std::string icon, title, description;
};
Status statusOfFailure(const client::Failure& failure, const std::string& socket);
Status statusWithoutAccount();
Status statusWithoutRecord();

}  // namespace vrx::settings
