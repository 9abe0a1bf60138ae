// The window: the list of devices beside the detail of one, or one of the two where there is no room for both. What was
// shown stays when the agent cannot be asked. Rows are changed in place, and what has not changed is left alone.
//
// The main thread only. The window's own actions: win.refresh, win.back.
#pragma once

#include <adwaita.h>

#include <memory>
#include <string>

namespace vrx::settings {

class Window final {
public:
    explicit Window(GtkApplication* application);
    ~Window();
    Window(const Window&) = delete;
    Window& operator=(const Window&) = delete;

    GtkWindow* window() const;
    void present();
    // Opens the device's detail, once it is known.
    void showDevice(const std::string& serialNumber);

private:
    class Content;
    const std::shared_ptr<Content> content_;
};

}  // namespace vrx::settings
