// A chronicle as a page for a browser: one file that needs no other and no network.
#pragma once

#include <string>

#include "timeline/chronicle.h"

namespace vrx::timeline {

// Texts of records and devices stand in the page as data only: nothing in them is markup or script.
std::string pageOf(const Chronicle& chronicle, const std::string& title);

// Writes it in the place of whatever is there. Returns what went wrong, or nothing.
std::string writePage(const std::string& file, const Chronicle& chronicle, const std::string& title);

}  // namespace vrx::timeline
