// Small parts of the page, and what GTK wants of texts that others have sent. The main thread only.
#pragma once

#include <adwaita.h>

#include <functional>
#include <initializer_list>
#include <string>
#include <vector>

#include "settings/model.h"

namespace vrx::settings {

// A text that GTK shows whatever it holds.
std::string shown(const std::string& text);
// The same for where GTK reads markup.
std::string escaped(const std::string& text);

// Calls it at each signal of the object, for as long as the object lives. Not for signals that want an answer.
void onSignal(gpointer object, const char* signal, std::function<void()> call);

// Brings a call to the main loop, from any thread.
void onMainLoop(std::function<void()> call);

AdwPreferencesGroup* group(const std::string& title, const std::string& description = "");

// A row with a title and a text below it, both of which wrap.
AdwActionRow* row(const std::string& title, const std::string& text);
// The same, which can be pressed and opens the address.
AdwActionRow* linkRow(const std::string& title, const std::string& address);

GtkWidget* textLabel(const std::string& text, std::initializer_list<const char*> classes = {});
// A text whose link opens its address.
GtkWidget* footerLabel(const Footer& footer);

// A button whose text wraps.
GtkWidget* textButton(const std::string& text, const char* styleClass, std::function<void()> pressed);
// A button with a picture, and its name for who does not see that.
GtkWidget* iconButton(const char* icon, const char* name, const char* action);

// Shows one child of a stack, and hides the others from who hears the window read out as well.
void showChild(GtkStack* stack, GtkWidget* child);

// A page of preferences whose groups can be exchanged, so that it keeps where it was scrolled to.
class GroupsPage {
public:
    GtkWidget* widget() const { return GTK_WIDGET(page_); }
    void show(const std::vector<AdwPreferencesGroup*>& groups);

private:
    AdwPreferencesPage* const page_ = ADW_PREFERENCES_PAGE(adw_preferences_page_new());
    std::vector<AdwPreferencesGroup*> groups_;
};

void openInBrowser(GtkWidget* from, const std::string& address);

}  // namespace vrx::settings
