#include "settings/widgets.h"

#include <utility>

namespace vrx::settings {

namespace {

std::string taken(char* text) {
    std::string copy(text);
    g_free(text);
    return copy;
}

void wrap(GtkLabel* label) {
    gtk_label_set_wrap(label, TRUE);
    gtk_label_set_wrap_mode(label, PANGO_WRAP_WORD_CHAR);
}

}  // namespace

std::string shown(const std::string& text) {
    std::string whole(text);
    std::erase(whole, '\0');
    return taken(g_utf8_make_valid(whole.data(), static_cast<gssize>(whole.size())));
}

std::string escaped(const std::string& text) {
    return taken(g_markup_escape_text(shown(text).c_str(), -1));
}

// Swapped, so that the function comes first, whatever arguments the signal has.
void onSignal(gpointer object, const char* signal, std::function<void()> call) {
    const auto handle = +[](gpointer data) { (*static_cast<std::function<void()>*>(data))(); };
    const auto end = +[](gpointer data, GClosure*) { delete static_cast<std::function<void()>*>(data); };
    g_signal_connect_data(object, signal, G_CALLBACK(handle), new std::function(std::move(call)), end,
                          G_CONNECT_SWAPPED);
}

// Never g_main_context_invoke(): while nobody owns the context, that would call at once, on this thread.
void onMainLoop(std::function<void()> call) {
    g_idle_add_full(
        G_PRIORITY_DEFAULT,
        [](gpointer data) -> gboolean {
            (*static_cast<std::function<void()>*>(data))();
            return G_SOURCE_REMOVE;
        },
        new std::function(std::move(call)), [](gpointer data) { delete static_cast<std::function<void()>*>(data); });
}

// Titles of groups are markup, and there is no switch for it.
AdwPreferencesGroup* group(const std::string& title, const std::string& description) {
    AdwPreferencesGroup* group = ADW_PREFERENCES_GROUP(adw_preferences_group_new());
    adw_preferences_group_set_title(group, escaped(title).c_str());
    if (!description.empty()) adw_preferences_group_set_description(group, escaped(description).c_str());
    return group;
}

AdwActionRow* row(const std::string& title, const std::string& text) {
    AdwActionRow* row = ADW_ACTION_ROW(adw_action_row_new());
    adw_preferences_row_set_use_markup(ADW_PREFERENCES_ROW(row), FALSE);
    adw_preferences_row_set_title(ADW_PREFERENCES_ROW(row), shown(title).c_str());
    adw_action_row_set_title_lines(row, 0);
    adw_action_row_set_subtitle(row, shown(text).c_str());
    adw_action_row_set_subtitle_lines(row, 0);
    return row;
}

AdwActionRow* linkRow(const std::string& title, const std::string& address) {
    AdwActionRow* link = row(title, "");
    GtkWidget* picture = gtk_image_new_from_icon_name("adw-external-link-symbolic");
    gtk_accessible_update_state(GTK_ACCESSIBLE(picture), GTK_ACCESSIBLE_STATE_HIDDEN, TRUE, -1);
    adw_action_row_add_suffix(link, picture);
    gtk_list_box_row_set_activatable(GTK_LIST_BOX_ROW(link), TRUE);
    gtk_widget_set_tooltip_text(GTK_WIDGET(link), shown(address).c_str());
    onSignal(link, "activated", [link, address] { openInBrowser(GTK_WIDGET(link), address); });
    return link;
}

GtkWidget* textLabel(const std::string& text, std::initializer_list<const char*> classes) {
    GtkWidget* label = gtk_label_new(shown(text).c_str());
    wrap(GTK_LABEL(label));
    gtk_label_set_xalign(GTK_LABEL(label), 0);
    for (const char* name : classes) gtk_widget_add_css_class(label, name);
    return label;
}

GtkWidget* footerLabel(const Footer& footer) {
    GtkWidget* label = textLabel("", {"caption"});
    std::string link = escaped(footer.label);
    if (!footer.address.empty()) link = "<a href=\"" + escaped(footer.address) + "\">" + link + "</a>";
    gtk_label_set_markup(GTK_LABEL(label), (escaped(footer.before) + link + escaped(footer.after)).c_str());
    gtk_widget_set_margin_top(label, 6);
    return label;
}

GtkWidget* textButton(const std::string& text, const char* styleClass, std::function<void()> pressed) {
    GtkWidget* button = gtk_button_new_with_label(shown(text).c_str());
    GtkLabel* label = GTK_LABEL(gtk_button_get_child(GTK_BUTTON(button)));
    wrap(label);
    gtk_label_set_justify(label, GTK_JUSTIFY_CENTER);
    gtk_widget_add_css_class(button, styleClass);
    onSignal(button, "clicked", std::move(pressed));
    return button;
}

GtkWidget* iconButton(const char* icon, const char* name, const char* action) {
    GtkWidget* button = gtk_button_new_from_icon_name(icon);
    gtk_widget_set_tooltip_text(button, name);
    gtk_accessible_update_property(GTK_ACCESSIBLE(button), GTK_ACCESSIBLE_PROPERTY_LABEL, name, -1);
    gtk_actionable_set_action_name(GTK_ACTIONABLE(button), action);
    return button;
}

void showChild(GtkStack* stack, GtkWidget* child) {
    gtk_widget_set_visible(child, TRUE);
    gtk_stack_set_visible_child(stack, child);
    for (GtkWidget* other = gtk_widget_get_first_child(GTK_WIDGET(stack)); other;
         other = gtk_widget_get_next_sibling(other))
        gtk_widget_set_visible(other, other == child);
}

void GroupsPage::show(const std::vector<AdwPreferencesGroup*>& groups) {
    GtkRoot* root = gtk_widget_get_root(widget());
    GtkWidget* focus = root ? gtk_root_get_focus(root) : nullptr;
    const bool hadFocus = focus && gtk_widget_is_ancestor(focus, widget());
    for (AdwPreferencesGroup* group : groups_) adw_preferences_page_remove(page_, group);
    groups_ = groups;
    for (AdwPreferencesGroup* group : groups_) adw_preferences_page_add(page_, group);
    if (hadFocus) gtk_widget_child_focus(widget(), GTK_DIR_TAB_FORWARD);
}

void openInBrowser(GtkWidget* from, const std::string& address) {
    GtkRoot* root = gtk_widget_get_root(from);
    gtk_show_uri(GTK_IS_WINDOW(root) ? GTK_WINDOW(root) : nullptr, address.c_str(), GDK_CURRENT_TIME);
}

}  // namespace vrx::settings
