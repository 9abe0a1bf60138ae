"""The notifier with a real agent and a notification server that only writes down what it is asked."""
import re
import subprocess
import unittest

from place import PHONE, SOURCE, WATCH, Place, wait

SERVER = "org.freedesktop.Notifications"


class NotifierTest(unittest.TestCase):
    def setUp(self):
        self.place = Place()
        self.addCleanup(self.place.close)

    def start_bus(self, display):
        """A session bus that starts the page by the service file of the package."""
        folder = self.place.folder
        (folder / "data/dbus-1/services").mkdir(parents=True)
        service = (SOURCE / "packaging/settings/com.orvane.Coverage.service").read_text()
        (folder / "data/dbus-1/services/com.orvane.Coverage.service").write_text(
            service.replace("/usr/lib/vrxagent-settings", str(folder / "settings")))
        bus = self.place.start("dbus-daemon", "--session", "--nofork", "--print-address", DISPLAY=display, GTK_A11Y="none")
        self.place.environment["DBUS_SESSION_BUS_ADDRESS"] = bus.stdout.readline().strip()

    def start_server(self):
        self.log = self.place.folder / "notify.log"
        self.place.start("/usr/bin/python3", "-m", "dbusmock", "--session", "--template", "notification_daemon", "-l", self.log)
        subprocess.run(["gdbus", "wait", "--session", "--timeout", "60", SERVER], env=self.place.environment, check=True)

    def start_notifier(self):
        return self.place.start(self.place.folder / "settings/vrx-settings-notify")

    def calls(self, text):
        return [line for line in self.log.read_text().splitlines() if text in line] if self.log.exists() else []

    def emit(self, signal, types, arguments):
        subprocess.run(["gdbus", "call", "--session", "--dest", SERVER, "--object-path", "/org/freedesktop/Notifications",
                        "--method", "org.freedesktop.DBus.Mock.EmitSignal", SERVER, signal, types, arguments],
                       env=self.place.environment, check=True, capture_output=True)

    def post(self, name, style=2):
        self.place.post({"uniqueIdentifier": name, "title": name, "displayStyle": style,
                         "userInfo": {"FollowupSerialNumber": WATCH}, "actions": [{"label": "Look"}]})

    def test_one_notification_an_offer(self):
        place = self.place
        place.begin((r"^name = \"Maya's Phone\"", 'name = "A <b>& B"'))
        display = place.start_display(1000, 700)
        self.start_bus(display)
        notifier = self.start_notifier()
        place.post_offer()
        self.start_server()  # comes when something waits for it already
        wait("a notification", lambda: self.calls('Notify "'))
        self.assertRegex(self.calls('Notify "')[0], r'"Coverage" 0 "com.orvane.Coverage" "Add QX Coverage" "A &lt;b>&amp; B" '
                         r'\["default", "", "show", "Add Coverage"\]')

        # Neither another number of days nor an item that wants no notification is news; what comes after them is.
        place.serve(PHONE, qxOfferEligibleUntil="@now+9d:ms")
        place.refresh("--update-follow-ups")
        self.assertIn("There are 9 days", place.pending())
        self.post("silent", style=1)
        self.post("loud")
        wait("another notification", lambda: self.calls('"loud"'))
        self.assertEqual(len(self.calls('Notify "')), 2)
        with open(f"/proc/{notifier.pid}/status") as status:
            memory = dict(re.findall(r"^(\w+):\s+(\d+) kB", status.read(), re.MULTILINE))
        self.assertLess(int(memory["RssAnon"]), 2048, memory)
        print("resident:", memory["VmRSS"], "kB, of its own:", memory["RssAnon"], "kB")

        # Closed by the user: not after the next login either. The other comes back then, and goes with its item.
        self.emit("NotificationClosed", "uu", "[<uint32 1>, <uint32 2>]")
        wait("it remembered", (place.folder / "state/vrx-settings/notified").exists)
        self.assertEqual(place.stop(notifier), 0)
        notifier = self.start_notifier()
        wait("the other again", lambda: len(self.calls('"loud"')) == 2)
        place.tool("vrxhost", "followups", "clear", "loud")
        wait("it taken back", lambda: len(self.calls("CloseNotification")) >= 2)
        self.post("new")
        wait("a new one", lambda: self.calls('"new"'))
        self.assertEqual(len(self.calls('Notify "')), 4)

        # Pressed: the bus starts the page, at that device.
        number = re.search(r"\d+", self.calls("CloseNotification")[-1].split("CloseNotification")[1])[0]
        self.emit("ActionInvoked", "us", f"[<uint32 {int(number) + 1}>, <'show'>]")
        titles = lambda: subprocess.run(["xdotool", "search", "--name", "^Maya's Watch$"], text=True, capture_output=True,
                                        env={**place.environment, "DISPLAY": display}).stdout
        wait("the page", titles)


if __name__ == "__main__":
    unittest.main()
