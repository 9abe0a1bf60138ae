"""What a page shows, as a screen reader has it."""
import subprocess

import pyatspi
from gi.repository import GLib

from place import wait

APPLICATION = "com.orvane.Coverage"
BUTTONS = ("push button", "button")  # the name of the role on Debian 12, and on Debian 13


class Screen:
    def __init__(self, display, environment):
        self.environment = {**environment, "DISPLAY": display}

    def all(self):
        """(role, name, accessible) of everything, in order. What changes meanwhile is looked at again by wait()."""
        found = []

        def walk(node):
            found.append((node.getRoleName(), node.name, node))
            for child in node:
                if child:
                    walk(child)

        try:
            for application in pyatspi.Registry.getDesktop(0):
                if application and application.name == APPLICATION:
                    walk(application)
        except GLib.GError:
            return []
        return found

    def find(self, name, role=None):
        return next((node for kind, text, node in self.all() if name in text and role in (None, kind)), None)

    def see(self, *names):
        for name in names:
            wait(f"{name!r} on the screen", lambda: self.find(name))

    def see_gone(self, name):
        wait(f"no {name!r} on the screen", lambda: (all_ := self.all()) and not any(name in text for _, text, _ in all_))

    def title(self, name):
        wait(f"the title {name!r}", lambda: any(kind == "frame" and text == name for kind, text, _ in self.all()))

    def press(self, name):
        """A button. A dialog's says its name twice, and comes first."""
        def pressed():
            buttons = [(text != name, node) for kind, text, node in self.all()
                       if kind in BUTTONS and text in (name, f"{name} {name}")]
            try:
                return buttons and max(buttons, key=lambda button: button[0])[1].queryAction().doAction(0)
            except GLib.GError:
                return False
        wait(f"the button {name!r}", pressed)

    def show(self, serial):
        """By the action of the application."""
        subprocess.run(["gdbus", "call", "--session", "--dest", APPLICATION, "--object-path", "/com/orvane/Coverage",
                        "--method", "org.gtk.Actions.Activate", "show", f"[<'{serial}'>]", "{}"], check=True,
                       capture_output=True)

    def fill(self):
        """Puts the window, for which there is no window manager, where the display is, and gives it the keys."""
        run = lambda *arguments: subprocess.run(["xdotool", *arguments], env=self.environment, text=True, check=False,
                                                capture_output=True).stdout.split()
        window = wait("the window", lambda: run("search", "--onlyvisible", "--class", APPLICATION))[-1]
        width, height = run("getdisplaygeometry")
        run("windowmove", "--sync", window, "0", "0")
        run("windowsize", "--sync", window, width, height)
        run("windowfocus", "--sync", window)

    def keys(self, *keys):
        subprocess.run(["xdotool", "key", *keys], env=self.environment, check=True)

    def click(self, name, role="list item"):
        """A row has no action: it is clicked in its middle, as soon as it has a place."""
        def place():
            row = self.find(name, role)
            box = row and row.queryComponent().getExtents(pyatspi.WINDOW_COORDS)
            return box and box.width > 0 and box
        box = wait(f"the row {name!r}", place)
        subprocess.run(["xdotool", "mousemove", str(box.x + box.width // 2), str(box.y + box.height // 2), "click", "1"],
                       env=self.environment, check=True)
