"""A folder of its own with an agent, a coverage server, displays and the page, all gone afterwards.

Whatever a test waits for, it looks for again and again, for a minute at most.
"""
import hashlib
import json
import os
import re
import shutil
import signal
import subprocess
import tempfile
import time
import urllib.request
from pathlib import Path

SOURCE = Path(__file__).resolve().parents[2]
PROGRAMS = Path(os.environ.get("VRX_PROGRAMS", SOURCE / "build/settings/bin"))
PHONE, WATCH = "VRXPHONE0001", "VRXWATCH0001"


def wait(what, look):
    """The first answer of look() that is true."""
    end = time.monotonic() + 60
    while time.monotonic() < end:
        answer = look()
        if answer:
            return answer
        time.sleep(0.02)  # between two looks
    raise AssertionError(f"waited in vain: {what}")


class Place:
    def __init__(self):
        self.folder = Path(tempfile.mkdtemp()).resolve()
        self.running = []
        self.agent = None
        for name in ("app", "run", "state", "config/vrxagent", "data/applications", "cache", "records", "locales"):
            (self.folder / name).mkdir(parents=True)
        for name in ("vrxagent", "vrxctl", "vrxhost", "vrx-coverage-server", "bundle.toml"):
            shutil.copy(PROGRAMS / name, self.folder / "app")
        shutil.copytree(PROGRAMS / "settings", self.folder / "settings")
        shutil.copy(SOURCE / "examples/credential-helper", self.folder / "app")
        self.profile = self.folder / "config/vrxagent/device.toml"
        self.environment = {
            **{name: value for name, value in os.environ.items() if name not in ("STATE_DIRECTORY", "NOTIFY_SOCKET", "DISPLAY")},
            "DBUS_SYSTEM_BUS_ADDRESS": "unix:path=/nowhere/bus", "VRXAGENT_SOCKET": str(self.folder / "run/com.orvane.vrxagent"),
            "XDG_RUNTIME_DIR": str(self.folder / "run"), "XDG_STATE_HOME": str(self.folder / "state"),
            "XDG_CONFIG_HOME": str(self.folder / "config"), "XDG_DATA_HOME": str(self.folder / "data"),
            "XDG_CACHE_HOME": str(self.folder / "cache"), "LOCPATH": str(self.folder / "locales"), "LC_ALL": "C.UTF-8",
            "GSK_RENDERER": "cairo", "no_proxy": "127.0.0.1",
        }
        self.environment.pop("LANGUAGE", None)
        (self.folder / "config/gtk-4.0").mkdir()
        (self.folder / "config/gtk-4.0/settings.ini").write_text("[Settings]\ngtk-enable-animations=0\n")
        self.take_addresses()

    def close(self):
        for process in reversed(self.running):
            if process.poll() is None:
                process.kill()
            process.wait()
        shutil.rmtree(self.folder, ignore_errors=True)

    def take_addresses(self):
        """The browser of this place writes down what it is to open."""
        applications = self.folder / "data/applications"
        browser = self.folder / "app/browser"
        browser.write_text(f'#!/bin/sh\necho "$1" >>{self.folder}/opened\n')
        browser.chmod(0o755)
        (applications / "browser.desktop").write_text(
            f"[Desktop Entry]\nType=Application\nName=Browser\nExec={browser} %u\n"
            "MimeType=x-scheme-handler/http;x-scheme-handler/https;\n")
        (self.folder / "config/mimeapps.list").write_text(
            "[Default Applications]\nx-scheme-handler/https=browser.desktop\nx-scheme-handler/http=browser.desktop\n")

    def opened(self):
        file = self.folder / "opened"
        return file.read_text().split() if file.exists() else []

    def start(self, *command, **environment):
        process = subprocess.Popen(list(map(str, command)), env={**self.environment, **environment}, cwd=self.folder,
                                   stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, text=True,
                                   stderr=open(self.folder / (Path(command[0]).name + ".err"), "a"))
        self.running.append(process)
        return process

    def stop(self, process):
        process.send_signal(signal.SIGTERM)
        return process.wait(60)

    # The agent and its server.

    def tool(self, *arguments):
        return subprocess.run([self.folder / "app" / arguments[0], *arguments[1:]], env=self.environment, text=True,
                              stdin=subprocess.DEVNULL, capture_output=True, timeout=60).stdout

    def start_agent(self):
        self.agent = self.start(self.folder / "app/vrxagent")
        wait("the agent", lambda: "deviceType" in self.tool("vrxctl", "device", "--json"))

    def stop_agent(self):
        assert self.stop(self.agent) == 0

    def start_server(self, port=0):
        server = self.start(self.folder / "app/vrx-coverage-server", "--records", self.folder / "records", "--port", port)
        self.control, self.url = "", ""
        for line in server.stdout:
            self.control = line.strip().removeprefix("control on ") if line.startswith("control") else self.control
            if line.startswith("listening on "):
                self.url = line.strip().removeprefix("listening on ")
                break
        return server

    def write_profile(self, *changes):
        """The example's, with (pattern, replacement) changes."""
        text = (SOURCE / "examples/device.toml").read_text()
        helper = f"credential_helper = ['{self.folder}/app/credential-helper', '{self.url}']"
        for pattern, replacement in [(r"^# credential_helper.*", helper), *changes]:
            text = re.sub(pattern, lambda _, new=replacement: new, text, flags=re.MULTILINE)
        new = self.profile.with_suffix(".new")
        new.write_text(text)
        new.replace(self.profile)

    def begin(self, *changes):
        """A server with a record for the phone and one for the watch, and an agent that has both."""
        self.server = self.start_server()
        for serial in (PHONE, WATCH):
            self.serve(serial)
        self.write_profile(*changes)
        self.start_agent()
        self.tool("vrxhost", "defaults", "write", "WarrantyURL", "--string", self.url + "/api/v2/coverage/summary")
        self.tool("vrxhost", "defaults", "write", "ServerVersionURL", "--string", self.url + "/library/ORVANE/asset/vrxV2.plist")
        wait("two records", lambda: len(self.refresh()) == 2)

    def serve(self, serial, **fields):
        """The device's record at the server."""
        record = json.loads((SOURCE / f"examples/records/{serial if serial in (PHONE, WATCH) else 'default'}.json").read_text())
        record.update(fields)
        new = self.folder / "new.json"
        new.write_text(json.dumps(record))
        new.replace(self.folder / f"records/{serial}.json")

    def refresh(self, *arguments):
        shown = json.loads(self.tool("vrxctl", "all", "--policy", "refresh", "--json", *arguments) or "{}")
        return [info for info in shown.get("devices", []) if info["coverage"]]

    def post_offer(self, serial=PHONE):
        """Posts the device's follow-up as the agent does, which then fills it from the record."""
        item = {"uniqueIdentifier": "com.orvane.Vireo." + hashlib.sha256(serial.encode()).hexdigest(),
                "displayStyle": 2, "userInfo": {"FollowupSerialNumber": serial}}
        self.post(item)
        self.refresh("--update-follow-ups")

    def post(self, item):
        (self.folder / "item.json").write_text(json.dumps(item))
        assert "Posted" in self.tool("vrxhost", "followups", "post", str(self.folder / "item.json"))

    def pending(self):
        return self.tool("vrxhost", "followups", "--json")

    # The display and the page.

    def start_display(self, width, height):
        out, end = os.pipe()
        display = subprocess.Popen(["Xvfb", "-displayfd", str(end), "-screen", "0", f"{width}x{height}x24", "-nolisten",
                                    "tcp", "-noreset"], pass_fds=[end], stderr=subprocess.DEVNULL)
        os.close(end)
        self.running.append(display)
        with open(out) as number:
            return f":{number.readline().strip()}"

    def start_page(self, display, **environment):
        return self.start(self.folder / "settings/vrx-settings", DISPLAY=display, **environment)

    def make_locale(self, name):
        subprocess.run(["localedef", "-i", name, "-f", "UTF-8", self.folder / f"locales/{name}.UTF-8"], check=False,
                       capture_output=True)
        return f"{name}.UTF-8"
