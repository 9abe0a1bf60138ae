// vrx-settings: the page that shows people the coverage of their devices, and the offers for them. The application's
// action "show" takes a serial number and opens that device.
#include <adwaita.h>

#include <memory>

#include "settings/window.h"
#include "settings/words.h"

namespace vrx::settings {
namespace {

struct Application {
    AdwApplication* application = nullptr;
    std::unique_ptr<Window> window{};
};

Window& presentedWindow(Application& self) {
    if (!self.window) self.window = std::make_unique<Window>(GTK_APPLICATION(self.application));
    self.window->present();
    return *self.window;
}

void activated(GApplication*, gpointer data) {
    presentedWindow(*static_cast<Application*>(data));
}

void showActivated(GSimpleAction*, GVariant* serialNumber, gpointer data) {
    presentedWindow(*static_cast<Application*>(data)).showDevice(g_variant_get_string(serialNumber, nullptr));
}

// A dialog is a window of the application as well.
void windowRemoved(GtkApplication*, GtkWindow* window, gpointer data) {
    auto& self = *static_cast<Application*>(data);
    if (self.window && self.window->window() == window) self.window.reset();
}

void addAccelerators(GtkApplication* application) {
    struct {
        const char* action;
        const char* keys[3];
    } const accelerators[] = {{"win.refresh", {"F5", "<Control>r"}},
                              {"win.back", {"<Alt>Left", "Escape"}},
                              {"window.close", {"<Control>w", "<Control>q"}}};
    for (const auto& [action, keys] : accelerators) gtk_application_set_accels_for_action(application, action, keys);
}

int run(int argc, char** argv) {
    useTranslations();
    g_set_prgname("com.orvane.Coverage");
    g_set_application_name(tr("Coverage"));
    Application self{.application = adw_application_new("com.orvane.Coverage", G_APPLICATION_DEFAULT_FLAGS)};
    const GActionEntry show{"show", showActivated, "s", nullptr, nullptr, {}};
    g_action_map_add_action_entries(G_ACTION_MAP(self.application), &show, 1, &self);
    g_signal_connect(self.application, "activate", G_CALLBACK(activated), &self);
    g_signal_connect(self.application, "window-removed", G_CALLBACK(windowRemoved), &self);
    addAccelerators(GTK_APPLICATION(self.application));
    const int code = g_application_run(G_APPLICATION(self.application), argc, argv);
    self.window.reset();
    g_object_unref(self.application);
    return code;
}

}  // namespace
}  // namespace vrx::settings

int main(int argc, char** argv) {
    return vrx::settings::run(argc, argv);
}
