#include "settings/device_rows.h"

#include <libintl.h>

#include <algorithm>
#include <utility>

#include "settings/widgets.h"
#include "settings/words.h"

namespace vrx::settings {

DeviceRows::DeviceRows(std::function<void(const std::string&)> choose) : list_(GTK_LIST_BOX(gtk_list_box_new())) {
    gtk_list_box_set_selection_mode(list_, GTK_SELECTION_NONE);
    gtk_accessible_update_property(GTK_ACCESSIBLE(list_), GTK_ACCESSIBLE_PROPERTY_LABEL, tr("Devices"), -1);
    const auto activated = +[](GtkListBox*, GtkListBoxRow* row, gpointer data) {
        const auto* serialNumber = static_cast<const std::string*>(g_object_get_data(G_OBJECT(row), "serial-number"));
        (*static_cast<std::function<void(const std::string&)>*>(data))(*serialNumber);
    };
    const auto end =
        +[](gpointer data, GClosure*) { delete static_cast<std::function<void(const std::string&)>*>(data); };
    g_signal_connect_data(list_, "row-activated", G_CALLBACK(activated), new std::function(std::move(choose)), end,
                          GConnectFlags());
}

void DeviceRows::show(const Situation& situation) {
    if (!std::ranges::equal(rows_, situation.devices, {}, &Row::serialNumber, &Device::serialNumber)) {
        for (const Row& row : rows_) gtk_list_box_remove(list_, GTK_WIDGET(row.row));
        rows_.clear();
        for (const Device& device : situation.devices) rows_.push_back(newRow(device));
        setColumn(isColumn_);
    }
    for (std::size_t i = 0; i < rows_.size(); ++i) update(rows_[i], situation.devices[i], situation);
}

DeviceRows::Row DeviceRows::newRow(const Device& device) {
    Row row{device.serialNumber, settings::row("", ""), gtk_label_new(""),
            gtk_image_new_from_icon_name("go-next-symbolic")};
    gtk_list_box_row_set_activatable(GTK_LIST_BOX_ROW(row.row), TRUE);
    GtkWidget* picture =
        gtk_image_new_from_icon_name(device.isWatch ? "preferences-system-time-symbolic" : "phone-symbolic");
    for (GtkWidget* decoration : {picture, row.arrow})
        gtk_accessible_update_state(GTK_ACCESSIBLE(decoration), GTK_ACCESSIBLE_STATE_HIDDEN, TRUE, -1);
    adw_action_row_add_prefix(row.row, picture);
    gtk_widget_add_css_class(row.badge, "badge");
    gtk_widget_set_valign(row.badge, GTK_ALIGN_CENTER);
    adw_action_row_add_suffix(row.row, row.badge);
    adw_action_row_add_suffix(row.row, row.arrow);
    g_object_set_data_full(G_OBJECT(row.row), "serial-number", new std::string(device.serialNumber),
                           [](gpointer data) { delete static_cast<std::string*>(data); });
    gtk_list_box_append(list_, GTK_WIDGET(row.row));
    return row;
}

void DeviceRows::update(const Row& row, const Device& device, const Situation& situation) const {
    adw_preferences_row_set_title(ADW_PREFERENCES_ROW(row.row), shown(nameOf(device)).c_str());
    adw_action_row_set_subtitle(row.row, coverageText(device).c_str());
    const auto badges = std::ranges::count_if(offersFor(situation, device.serialNumber), &Offer::hasBadge);
    const auto number = static_cast<unsigned long>(badges);
    char* spoken = g_strdup_printf(ngettext("%lu offer", "%lu offers", number), number);
    char* written = g_strdup_printf("%lu", number);
    gtk_label_set_text(GTK_LABEL(row.badge), written);
    gtk_accessible_update_property(GTK_ACCESSIBLE(row.badge), GTK_ACCESSIBLE_PROPERTY_LABEL, spoken, -1);
    gtk_widget_set_visible(row.badge, badges > 0);
    g_free(spoken);
    g_free(written);
}

void DeviceRows::setColumn(bool isColumn) {
    isColumn_ = isColumn;
    gtk_list_box_set_selection_mode(list_, isColumn ? GTK_SELECTION_SINGLE : GTK_SELECTION_NONE);
    (isColumn ? gtk_widget_remove_css_class : gtk_widget_add_css_class)(widget(), "boxed-list");
    (isColumn ? gtk_widget_add_css_class : gtk_widget_remove_css_class)(widget(), "navigation-sidebar");
    for (const Row& row : rows_) gtk_widget_set_visible(row.arrow, !isColumn);
}

void DeviceRows::select(const std::string& serialNumber) {
    if (!isColumn_) return;
    const auto row = std::ranges::find(rows_, serialNumber, &Row::serialNumber);
    gtk_list_box_select_row(list_, row == rows_.end() ? nullptr : GTK_LIST_BOX_ROW(row->row));
}

}  // namespace vrx::settings
