#include "settings/window.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <optional>
#include <utility>
#include <vector>

#include "settings/detail.h"
#include "settings/device_rows.h"
#include "settings/source.h"
#include "settings/widgets.h"
#include "settings/words.h"

namespace vrx::settings {

namespace {

constexpr const char* styles = R"(
.badge { background-color: @accent_bg_color; color: @accent_fg_color; border-radius: 999px; min-width: 1.2em;
         padding: 1px 5px; font-weight: bold; }
.notice { background-color: alpha(@warning_color, 0.2); padding: 9px 12px; }
)";

void useStyles() {
    GtkCssProvider* provider = gtk_css_provider_new();
    gtk_css_provider_load_from_data(provider, styles, -1);
    gtk_style_context_add_provider_for_display(gdk_display_get_default(), GTK_STYLE_PROVIDER(provider),
                                               GTK_STYLE_PROVIDER_PRIORITY_APPLICATION);
    g_object_unref(provider);
}

GtkWidget* column(std::initializer_list<GtkWidget*> parts) {
    GtkWidget* box = gtk_box_new(GTK_ORIENTATION_VERTICAL, 0);
    for (GtkWidget* part : parts) gtk_box_append(GTK_BOX(box), part);
    return box;
}

GtkWidget* titledHeader() {
    GtkWidget* header = adw_header_bar_new();
    adw_header_bar_set_title_widget(ADW_HEADER_BAR(header), adw_window_title_new(tr("Coverage"), ""));
    return header;
}

GtkWidget* statusPage() {
    GtkWidget* page = adw_status_page_new();
    gtk_widget_set_vexpand(page, TRUE);
    return page;
}

void setStatus(GtkWidget* page, const Status& status) {
    adw_status_page_set_icon_name(ADW_STATUS_PAGE(page), status.icon.c_str());
    adw_status_page_set_title(ADW_STATUS_PAGE(page), escaped(status.title).c_str());
    adw_status_page_set_description(ADW_STATUS_PAGE(page), escaped(status.description).c_str());
}

}  // namespace

class Window::Content {
public:
    explicit Content(GtkApplication* application);
    ~Content() { forgetTimer(); }
    Content(const Content&) = delete;
    Content& operator=(const Content&) = delete;

    void ask();
    void stopAsking();
    void open(const std::string& serialNumber);
    GtkWindow* window() const { return GTK_WINDOW(window_); }

private:
    void buildList();
    void buildDetail();
    void buildRoot();
    void addAction(const char* name, void (Content::*act)());

    void show(const Situation& situation);
    void showRoot();
    void showOthers();
    void showDetail();
    void drawDevice(const Device& device);
    void drawOffer(const Offer& offer);
    void showLayout();
    void showProgress(bool isRefreshing);
    void setTimer();
    void forgetTimer();
    void toast(const char* text);

    void back();
    void refresh();
    void confirmDismissal(const Offer& offer);

    bool isFolded() const { return adw_leaflet_get_folded(leaflet_); }
    bool isListVisible() const { return adw_leaflet_get_visible_child(leaflet_) == listSide_; }
    const Offer* openedOffer() const;
    OfferHandlers offerHandlers();

    GtkWidget* const window_;
    AdwToastOverlay* const toasts_ = ADW_TOAST_OVERLAY(adw_toast_overlay_new());
    GtkStack* const root_ = GTK_STACK(gtk_stack_new());
    GtkWidget *const waitingPage_ = column({}), *const statusPage_ = column({}), *const contentPage_ = column({});
    GtkWidget* const status_ = statusPage();
    std::string statusTitle_;
    AdwLeaflet* const leaflet_ = ADW_LEAFLET(adw_leaflet_new());
    GtkWidget* const notice_ = textLabel("", {"notice"});

    GtkWidget* const listSide_ = column({});
    GtkWidget* const listHeader_ = titledHeader();
    GtkWidget* const refreshButton_ = iconButton("view-refresh-symbolic", tr("Refresh"), "win.refresh");
    GtkWidget* const spinner_ = gtk_spinner_new();
    GtkBox* const others_ = GTK_BOX(gtk_box_new(GTK_ORIENTATION_VERTICAL, 12));
    DeviceRows list_;

    GtkWidget* const detailSide_ = column({});
    GtkWidget* const detailHeader_ = adw_header_bar_new();
    GtkWidget* const detailTitle_ = adw_window_title_new("", "");
    GtkWidget* const backButton_ = iconButton("go-previous-symbolic", tr("Back"), "win.back");
    GtkStack* const details_ = GTK_STACK(gtk_stack_new());
    GtkWidget* const deviceStatus_ = statusPage();
    GroupsPage devicePage_, offerPage_;

    Situation situation_;
    bool wasTold_ = false;
    std::string opened_, wanted_;  // serial numbers; one that is wanted is not known yet
    std::string openedOffer_;      // its identifier
    // What the pages were made of.
    std::optional<Device> drawnDevice_, drawnOfferDevice_;
    std::vector<Offer> drawnOffers_, drawnOthers_;
    std::optional<Offer> drawnOffer_;
    guint timer_ = 0;
    std::unique_ptr<Source> source_;
};

Window::Content::Content(GtkApplication* application)
    : window_(adw_application_window_new(application)),
      list_([this](const std::string& serialNumber) { open(serialNumber); }) {
    useStyles();
    gtk_window_set_default_size(window(), 860, 640);
    gtk_window_set_icon_name(window(), "com.orvane.Coverage");
    addAction("refresh", &Content::refresh);
    addAction("back", &Content::back);
    buildList();
    buildDetail();
    buildRoot();
    onSignal(leaflet_, "notify::folded", [this] { showLayout(); });
    onSignal(leaflet_, "notify::visible-child", [this] { showLayout(); });
    onSignal(window_, "notify::is-active", [this] {
        if (gtk_window_is_active(window()) && source_) source_->look();
    });
    showRoot();
}

void Window::Content::addAction(const char* name, void (Content::*act)()) {
    GSimpleAction* action = g_simple_action_new(name, nullptr);
    onSignal(action, "activate", [this, act] { (this->*act)(); });
    g_action_map_add_action(G_ACTION_MAP(window_), G_ACTION(action));
    g_object_unref(action);
}

void Window::Content::buildList() {
    adw_header_bar_pack_start(ADW_HEADER_BAR(listHeader_), refreshButton_);
    adw_header_bar_pack_start(ADW_HEADER_BAR(listHeader_), spinner_);
    gtk_accessible_update_property(GTK_ACCESSIBLE(spinner_), GTK_ACCESSIBLE_PROPERTY_LABEL, tr("Refreshing"), -1);
    gtk_widget_set_visible(spinner_, FALSE);

    GtkWidget* parts = column({GTK_WIDGET(others_), list_.widget()});
    GtkWidget* clamp = adw_clamp_new();
    adw_clamp_set_child(ADW_CLAMP(clamp), parts);
    GtkWidget* scrolled = gtk_scrolled_window_new();
    gtk_scrolled_window_set_policy(GTK_SCROLLED_WINDOW(scrolled), GTK_POLICY_NEVER, GTK_POLICY_AUTOMATIC);
    gtk_scrolled_window_set_child(GTK_SCROLLED_WINDOW(scrolled), clamp);
    gtk_widget_set_vexpand(scrolled, TRUE);
    gtk_box_append(GTK_BOX(listSide_), listHeader_);
    gtk_box_append(GTK_BOX(listSide_), scrolled);
    gtk_widget_set_size_request(listSide_, 320, -1);
}

void Window::Content::buildDetail() {
    adw_header_bar_pack_start(ADW_HEADER_BAR(detailHeader_), backButton_);
    adw_header_bar_set_title_widget(ADW_HEADER_BAR(detailHeader_), detailTitle_);
    setStatus(deviceStatus_, statusWithoutRecord());
    GtkWidget* again = textButton(tr("Refresh"), "pill", [this] { refresh(); });
    gtk_widget_set_halign(again, GTK_ALIGN_CENTER);
    adw_status_page_set_child(ADW_STATUS_PAGE(deviceStatus_), again);
    for (GtkWidget* page : {devicePage_.widget(), offerPage_.widget(), deviceStatus_})
        gtk_stack_add_child(details_, page);
    gtk_widget_set_vexpand(GTK_WIDGET(details_), TRUE);
    gtk_box_append(GTK_BOX(detailSide_), detailHeader_);
    gtk_box_append(GTK_BOX(detailSide_), GTK_WIDGET(details_));
    gtk_widget_set_hexpand(detailSide_, TRUE);
    gtk_widget_set_size_request(detailSide_, 300, -1);
}

void Window::Content::buildRoot() {
    adw_leaflet_append(leaflet_, listSide_);
    adw_leaflet_page_set_navigatable(adw_leaflet_append(leaflet_, gtk_separator_new(GTK_ORIENTATION_VERTICAL)), FALSE);
    adw_leaflet_append(leaflet_, detailSide_);
    adw_leaflet_set_can_navigate_back(leaflet_, TRUE);
    gtk_widget_set_vexpand(GTK_WIDGET(leaflet_), TRUE);

    GtkWidget* again = textButton(tr("Try Again"), "pill", [this] { ask(); });
    gtk_widget_set_halign(again, GTK_ALIGN_CENTER);
    adw_status_page_set_child(ADW_STATUS_PAGE(status_), again);
    GtkWidget* waiting = gtk_spinner_new();
    gtk_spinner_start(GTK_SPINNER(waiting));
    gtk_widget_set_vexpand(waiting, TRUE);
    gtk_accessible_update_property(GTK_ACCESSIBLE(waiting), GTK_ACCESSIBLE_PROPERTY_LABEL, tr("Loading"), -1);
    const auto append = [](GtkWidget* page, std::initializer_list<GtkWidget*> parts) {
        for (GtkWidget* part : parts) gtk_box_append(GTK_BOX(page), part);
    };
    append(waitingPage_, {titledHeader(), waiting});
    append(statusPage_, {titledHeader(), status_});
    append(contentPage_, {GTK_WIDGET(leaflet_), notice_});
    for (GtkWidget* page : {waitingPage_, statusPage_, contentPage_}) gtk_stack_add_child(root_, page);
    adw_toast_overlay_set_child(toasts_, GTK_WIDGET(root_));
    adw_application_window_set_content(ADW_APPLICATION_WINDOW(window_), GTK_WIDGET(toasts_));
}

// Makes the connections anew: an agent may by now be at another place.
void Window::Content::ask() {
    source_.reset();
    showProgress(false);
    source_ = std::make_unique<Source>(
        onMainLoop,
        Source::Page{
            .show = [this](const Situation& situation) { show(situation); },
            .progress = [this](bool isRefreshing) { showProgress(isRefreshing); },
            .refreshed =
                [this](bool isComplete) {
                    if (!isComplete) toast(tr("Not everything could be refreshed"));
                },
            .dismissed =
                [this](bool isDismissed) {
                    toast(isDismissed ? tr("Offer dismissed") : tr("The offer could not be dismissed"));
                },
        },
        situation_);
}

void Window::Content::stopAsking() {
    forgetTimer();
    source_.reset();
}

void Window::Content::show(const Situation& situation) {
    situation_ = situation;
    wasTold_ = true;
    list_.show(situation_);
    showOthers();
    if (!wanted_.empty() && deviceWith(situation_, wanted_)) open(std::exchange(wanted_, ""));
    showDetail();
    showRoot();
    setTimer();
}

void Window::Content::showRoot() {
    const bool hasRecord =
        std::ranges::any_of(situation_.devices, [](const Device& device) { return device.record.has_value(); });
    const bool isEmpty = situation_.devices.empty() && situation_.offers.empty();
    GtkWidget* page = contentPage_;
    if (!wasTold_) {
        page = waitingPage_;
    } else if (isEmpty || (!situation_.isSignedIn && !hasRecord && situation_.offers.empty())) {
        page = statusPage_;
        const Status status = situation_.failure && isEmpty
                                  ? statusOfFailure(*situation_.failure, source_ ? source_->socketPath() : "")
                              : situation_.isSignedIn ? statusWithoutRecord()
                                                      : statusWithoutAccount();
        statusTitle_ = status.title;
        setStatus(status_, status);
    }
    showChild(root_, page);
    gtk_widget_set_visible(notice_, situation_.failure.has_value());
    if (situation_.failure) {
        const Status status = statusOfFailure(*situation_.failure, source_ ? source_->socketPath() : "");
        const std::string text = with(tr("%s. What is shown was known before."), status.title);
        gtk_label_set_text(GTK_LABEL(notice_), shown(text).c_str());
        gtk_widget_set_tooltip_text(notice_, shown(status.description).c_str());
    }
    showLayout();
}

// Offers that belong to no device stand above the list: nothing else would show them.
void Window::Content::showOthers() {
    std::vector<Offer> offers = offersFor(situation_, "");
    if (offers == drawnOthers_) return;
    drawnOthers_ = std::move(offers);
    while (GtkWidget* child = gtk_widget_get_first_child(GTK_WIDGET(others_))) gtk_box_remove(others_, child);
    for (const Offer& offer : drawnOthers_) gtk_box_append(others_, GTK_WIDGET(offerGroup(offer, offerHandlers())));
}

void Window::Content::showDetail() {
    if (!deviceWith(situation_, opened_)) {
        openedOffer_.clear();
        if (isFolded()) adw_leaflet_set_visible_child(leaflet_, listSide_);
        opened_ = situation_.devices.empty() ? "" : situation_.devices.front().serialNumber;
    }
    const Offer* offer = openedOffer();
    if (!offer) openedOffer_.clear();
    if (const Device* device = deviceWith(situation_, opened_)) drawDevice(*device);
    if (offer) drawOffer(*offer);
    const bool isBare = drawnDevice_ && !drawnDevice_->record && drawnOffers_.empty();
    showChild(details_, offer ? offerPage_.widget() : isBare ? deviceStatus_ : devicePage_.widget());
    list_.select(opened_);
    showLayout();
}

void Window::Content::drawDevice(const Device& device) {
    std::vector<Offer> offers = offersFor(situation_, device.serialNumber);
    if (device == drawnDevice_ && offers == drawnOffers_) return;
    drawnDevice_ = device;
    drawnOffers_ = std::move(offers);
    devicePage_.show(deviceGroups(device, drawnOffers_, offerHandlers()));
}

void Window::Content::drawOffer(const Offer& offer) {
    const Device* device = deviceWith(situation_, offer.serialNumber);
    std::optional<Device> of = device ? std::optional(*device) : std::nullopt;
    if (offer == drawnOffer_ && of == drawnOfferDevice_) return;
    drawnOffer_ = offer;
    drawnOfferDevice_ = std::move(of);
    offerPage_.show(offerDetailsGroups(offer, device, offerHandlers()));
}

// The window's title is that of the page that is seen, for who hears it.
void Window::Content::showLayout() {
    list_.setColumn(!isFolded());
    list_.select(opened_);
    const int margin = isFolded() ? 12 : 0;
    for (GtkWidget* part : {list_.widget(), GTK_WIDGET(others_)}) {
        gtk_widget_set_margin_start(part, margin);
        gtk_widget_set_margin_end(part, margin);
        gtk_widget_set_margin_top(part, margin);
    }
    adw_header_bar_set_show_end_title_buttons(ADW_HEADER_BAR(listHeader_), isFolded());
    adw_header_bar_set_show_start_title_buttons(ADW_HEADER_BAR(detailHeader_), isFolded());

    const Offer* offer = openedOffer();
    const Device* device = deviceWith(situation_, opened_);
    const std::string title = offer    ? (offer->title.empty() ? tr("Offer") : offer->title)
                              : device ? nameOf(*device)
                                       : tr("Coverage");
    adw_window_title_set_title(ADW_WINDOW_TITLE(detailTitle_), shown(title).c_str());
    gtk_widget_set_visible(backButton_, isFolded() || offer);
    const GtkWidget* page = gtk_stack_get_visible_child(root_);
    const bool isDetail = page == contentPage_ && !(isFolded() && isListVisible());
    gtk_window_set_title(window(), page == statusPage_ ? statusTitle_.c_str()
                                   : isDetail          ? shown(title).c_str()
                                                       : tr("Coverage"));
}

void Window::Content::showProgress(bool isRefreshing) {
    gtk_widget_set_visible(spinner_, isRefreshing);
    gtk_widget_set_visible(refreshButton_, !isRefreshing);
    gtk_spinner_set_spinning(GTK_SPINNER(spinner_), isRefreshing);
}

void Window::Content::setTimer() {
    constexpr platform::Duration shortest(1), longest(86400);  // a timer stands still while the machine sleeps
    forgetTimer();
    if (!situation_.nextTextChange) return;
    const platform::Duration left = *situation_.nextTextChange - std::chrono::system_clock::now();
    const double seconds = std::ceil(std::clamp(left, shortest, longest).count());
    timer_ = g_timeout_add_seconds(
        static_cast<guint>(seconds),
        [](gpointer data) -> gboolean {
            auto* content = static_cast<Content*>(data);
            content->timer_ = 0;
            if (content->source_) content->source_->look();
            return G_SOURCE_REMOVE;
        },
        this);
}

void Window::Content::forgetTimer() {
    if (const guint timer = std::exchange(timer_, 0)) g_source_remove(timer);
}

void Window::Content::toast(const char* text) {
    adw_toast_overlay_add_toast(toasts_, adw_toast_new(escaped(text).c_str()));
}

// A device that is not known yet is opened once it is.
void Window::Content::open(const std::string& serialNumber) {
    if (!deviceWith(situation_, serialNumber)) {
        wanted_ = serialNumber;
        return;
    }
    wanted_.clear();
    opened_ = serialNumber;
    openedOffer_.clear();
    showDetail();
    adw_leaflet_set_visible_child(leaflet_, detailSide_);
    gtk_widget_child_focus(GTK_WIDGET(details_), GTK_DIR_TAB_FORWARD);
    showLayout();
}

void Window::Content::back() {
    if (openedOffer()) {
        openedOffer_.clear();
        showDetail();
        gtk_widget_child_focus(GTK_WIDGET(details_), GTK_DIR_TAB_FORWARD);
    } else if (isFolded()) {
        adw_leaflet_set_visible_child(leaflet_, listSide_);
        gtk_widget_child_focus(list_.widget(), GTK_DIR_TAB_FORWARD);
    }
}

void Window::Content::refresh() {
    if (source_) source_->refresh();
}

const Offer* Window::Content::openedOffer() const {
    const auto offer = std::ranges::find(situation_.offers, openedOffer_, &Offer::identifier);
    return offer == situation_.offers.end() ? nullptr : &*offer;
}

OfferHandlers Window::Content::offerHandlers() {
    return {.showDetails =
                [this](const Offer& offer) {
                    openedOffer_ = offer.identifier;
                    showDetail();
                    adw_leaflet_set_visible_child(leaflet_, detailSide_);
                    gtk_widget_child_focus(GTK_WIDGET(details_), GTK_DIR_TAB_FORWARD);
                    showLayout();
                },
            .dismiss = [this](const Offer& offer) { confirmDismissal(offer); }};
}

// It is for good, so it is asked first.
void Window::Content::confirmDismissal(const Offer& offer) {
    GtkWidget* dialog = adw_message_dialog_new(window(), tr("Dismiss This Offer?"),
                                               tr("It is not shown again, and cannot be brought back here."));
    AdwMessageDialog* question = ADW_MESSAGE_DIALOG(dialog);
    adw_message_dialog_add_response(question, "keep", tr("Keep"));
    adw_message_dialog_add_response(question, "dismiss", tr("Dismiss"));
    adw_message_dialog_set_response_appearance(question, "dismiss", ADW_RESPONSE_DESTRUCTIVE);
    adw_message_dialog_set_default_response(question, "keep");
    adw_message_dialog_set_close_response(question, "keep");
    onSignal(dialog, "response::dismiss", [this, identifier = offer.identifier] {
        if (source_) source_->dismiss(identifier);
    });
    gtk_window_present(GTK_WINDOW(dialog));
}

Window::Window(GtkApplication* application) : content_(std::make_shared<Content>(application)) {
    content_->ask();
    // The widgets, which call the content, may outlive this.
    onSignal(content_->window(), "destroy", [content = content_] { content->stopAsking(); });
}

Window::~Window() {
    content_->stopAsking();
}

GtkWindow* Window::window() const {
    return content_->window();
}

void Window::present() {
    gtk_window_present(content_->window());
}

void Window::showDevice(const std::string& serialNumber) {
    content_->open(serialNumber);
}

}  // namespace vrx::settings
