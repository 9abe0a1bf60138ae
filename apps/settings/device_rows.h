// The list of devices: a row for each, with its coverage in words and a badge where an offer carries one. The main
// thread only.
#pragma once

#include <adwaita.h>

#include <functional>
#include <string>
#include <vector>

#include "settings/model.h"

namespace vrx::settings {

class DeviceRows final {
public:
    // Called with the serial number of a device that is chosen.
    explicit DeviceRows(std::function<void(const std::string&)> choose);

    GtkWidget* widget() const { return GTK_WIDGET(list_); }
    // Changes the rows in place while the devices are the same.
    void show(const Situation& situation);
    // In a column of its own the list keeps a row selected; as a page it is a card of rows to press.
    void setColumn(bool isColumn);
    void select(const std::string& serialNumber);

private:
    struct Row {
        std::string serialNumber;
        AdwActionRow* row;
        GtkWidget* badge;
        GtkWidget* arrow;
    };

    Row newRow(const Device& device);
    void update(const Row& row, const Device& device, const Situation& situation) const;

    GtkListBox* const list_;
    std::vector<Row> rows_;
    bool isColumn_ = false;
};

}  // namespace vrx::settings
