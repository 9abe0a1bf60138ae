#include "settings/detail.h"

#include <algorithm>

#include "settings/widgets.h"
#include "settings/words.h"

namespace vrx::settings {

namespace {

using Groups = std::vector<AdwPreferencesGroup*>;

void add(AdwPreferencesGroup* group, AdwActionRow* row) {
    adw_preferences_group_add(group, GTK_WIDGET(row));
}

void addEntries(AdwPreferencesGroup* group, const std::vector<Entry>& entries) {
    for (const Entry& entry : entries)
        add(group, entry.label.empty() ? row(entry.value, "") : row(entry.label, entry.value));
}

void addFooter(AdwPreferencesGroup* group, const Footer& footer) {
    if (!footer.isEmpty()) adw_preferences_group_add(group, footerLabel(footer));
}

// A card that is one row, with what a row of titles has no room for.
GtkBox* addCard(AdwPreferencesGroup* group) {
    GtkWidget* box = gtk_box_new(GTK_ORIENTATION_VERTICAL, 6);
    gtk_widget_set_margin_top(box, 12);
    gtk_widget_set_margin_bottom(box, 12);
    gtk_widget_set_margin_start(box, 12);
    gtk_widget_set_margin_end(box, 12);
    GtkWidget* card = adw_preferences_row_new();
    gtk_list_box_row_set_activatable(GTK_LIST_BOX_ROW(card), FALSE);
    gtk_widget_set_focusable(card, FALSE);
    gtk_list_box_row_set_child(GTK_LIST_BOX_ROW(card), box);
    adw_preferences_group_add(group, card);
    return GTK_BOX(box);
}

bool hasDigit(const std::string& text) {
    return std::ranges::any_of(text, [](char c) { return c >= '0' && c <= '9'; });
}

// The server names the date, states it, or leaves a place for it; it is shown once.
void addEndDate(AdwPreferencesGroup* group, const Record& record) {
    const std::string day = record.endDate ? dayText(*record.endDate) : "";
    const std::size_t place = record.endDateFormat.find("%@");
    if (!record.expirationLabel.empty())
        add(group, row(record.expirationLabel, hasDigit(record.expirationLabel) ? "" : day));
    else if (!day.empty() && place != std::string::npos)
        add(group, row(std::string(record.endDateFormat).replace(place, 2, day), ""));
}

AdwPreferencesGroup* coverageGroup(const Device& device) {
    const Record& record = *device.record;
    AdwPreferencesGroup* shown = group(tr("Coverage"));
    add(shown, row(record.label.empty() ? coverageText(device) : record.label, record.description));
    addEndDate(shown, record);
    if (!record.partner.empty()) add(shown, row(record.partner, ""));
    for (const Footer& footer : record.footers) addFooter(shown, footer);
    return shown;
}

void addBenefits(Groups& groups, const Record& record) {
    const bool isEmpty = record.benefitsTitle.empty() && record.benefits.empty() && record.benefitsFooter.empty();
    if (isEmpty && record.benefitsSubtitle.empty()) return;
    groups.push_back(group(record.benefitsTitle, record.benefitsSubtitle));
    addEntries(groups.back(), record.benefits);
    addFooter(groups.back(), {.before = record.benefitsFooter});
}

void addDetails(Groups& groups, const Record& record) {
    if (record.details.empty() && record.detailsFooter.isEmpty()) return;
    groups.push_back(group(record.detailsTitle));
    addEntries(groups.back(), record.details);
    addFooter(groups.back(), record.detailsFooter);
}

void addLinks(Groups& groups, const Record& record, bool withSupport) {
    const bool hasSupport = withSupport && !record.supportAddress.empty();
    if (!hasSupport && record.agreementsAddress.empty()) return;
    groups.push_back(group(tr("Help")));
    if (hasSupport)
        add(groups.back(),
            linkRow(record.supportLabel.empty() ? tr("Get Support") : record.supportLabel, record.supportAddress));
    if (!record.agreementsAddress.empty()) add(groups.back(), linkRow(tr("Agreements"), record.agreementsAddress));
}

GtkWidget* dismissButton(const Offer& offer, const OfferHandlers& handlers) {
    return textButton(tr("Dismiss…"), "flat", [offer, handlers] { handlers.dismiss(offer); });
}

}  // namespace

AdwPreferencesGroup* offerGroup(const Offer& offer, const OfferHandlers& handlers) {
    AdwPreferencesGroup* shown = group("");
    GtkBox* card = addCard(shown);
    gtk_box_append(card, textLabel(offer.title.empty() ? tr("Offer") : offer.title, {"heading"}));
    if (!offer.text.empty()) gtk_box_append(card, textLabel(offer.text));
    for (const OfferAction& action : offer.actions)
        gtk_box_append(card, textButton(action.label.empty() ? tr("Show") : action.label, "suggested-action",
                                        [offer, action, handlers, card] {
                                            if (action.address.empty()) return handlers.showDetails(offer);
                                            openInBrowser(GTK_WIDGET(card), action.address);
                                        }));
    gtk_box_append(card, dismissButton(offer, handlers));
    return shown;
}

Groups deviceGroups(const Device& device, const std::vector<Offer>& offers, const OfferHandlers& handlers) {
    Groups groups;
    for (const Offer& offer : offers) groups.push_back(offerGroup(offer, handlers));
    if (device.record) {
        groups.push_back(coverageGroup(device));
        addDetails(groups, *device.record);
        addBenefits(groups, *device.record);
        addLinks(groups, *device.record, device.record->offersSupport);
    }
    if (!device.serialNumber.empty()) {
        groups.push_back(group(""));
        AdwActionRow* serialNumber = row(tr("Serial Number"), "");
        GtkWidget* text = textLabel(device.serialNumber, {"dim-label"});
        gtk_label_set_selectable(GTK_LABEL(text), TRUE);
        adw_action_row_add_suffix(serialNumber, text);
        add(groups.back(), serialNumber);
    }
    return groups;
}

Groups offerDetailsGroups(const Offer& offer, const Device* device, const OfferHandlers& handlers) {
    const Record* record = device && device->record ? &*device->record : nullptr;
    const OfferDetails details = record ? record->offer : OfferDetails{};
    AdwPreferencesGroup* texts = group("");
    GtkBox* card = addCard(texts);
    const std::string text = offer.text.empty() ? details.text : offer.text;
    gtk_box_append(card, textLabel(details.label.empty() ? offer.title : details.label, {"heading"}));
    for (const std::string& paragraph : {details.details, text, details.period})
        if (!paragraph.empty()) gtk_box_append(card, textLabel(paragraph));
    Groups groups{texts};
    if (record) addLinks(groups, *record, true);
    groups.push_back(group(""));
    adw_preferences_group_add(groups.back(), dismissButton(offer, handlers));
    return groups;
}

}  // namespace vrx::settings
