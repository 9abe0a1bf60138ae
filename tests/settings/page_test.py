"""The settings page with a real agent and a coverage server, as a screen reader sees it. Needs a session bus."""
import unittest

from place import PHONE, Place, wait
from screen import Screen


class PageTest(unittest.TestCase):
    def setUp(self):
        self.place = Place()
        self.addCleanup(self.place.close)

    def open_page(self, width=1000, height=700, **environment):
        display = self.place.start_display(width, height)
        self.page = self.place.start_page(display, **environment)
        self.screen = Screen(display, self.place.environment)
        self.screen.fill()
        return self.screen

    def has_offer(self):
        return "Add QX Coverage" in self.place.pending()

    def test_offer_from_posted_to_dismissed(self):
        place = self.place
        place.begin()
        place.serve(PHONE, qxOfferEligibleUntil="@now+5d:ms")
        screen = self.open_page()
        screen.title("Maya's Phone")
        screen.see("Maya's Watch", "Covered until ", "No coverage information", "Limited Warranty", "Learn more…")
        self.assertIsNone(screen.find("Add QX Coverage"))
        place.post_offer()
        screen.see("Add QX Coverage", "There are 5 days left", "1 offer")

        screen.press("Add Coverage")
        screen.title("Add QX Coverage")
        screen.see("QX adds repairs after accidental damage", "Eligible for 5 more days")
        screen.click("Agreements")
        wait("the browser", lambda: place.opened() == ["https://support.orvane.example/agreements"])
        screen.press("Back")
        screen.title("Maya's Phone")

        screen.press("Dismiss…")
        screen.press("Keep")
        screen.see_gone("Dismiss This Offer?")
        self.assertTrue(self.has_offer())
        screen.press("Dismiss…")
        screen.press("Dismiss")
        screen.see_gone("Add QX Coverage")
        self.assertFalse(self.has_offer())
        screen.press("Close")
        self.assertEqual(self.page.wait(60), 0)

    def test_what_changes_is_shown_and_what_was_known_stays(self):
        place = self.place
        place.begin()
        screen = self.open_page()
        screen.see("Limited Warranty")
        place.serve(PHONE, coverageLocalizedLabel="Better <Warranty> & More", kelURL="file:///etc/passwd",
                    supportAppURL=["https://a.example"], coverageLocalizedDescLong=7)
        place.refresh()
        screen.see("Better <Warranty> & More", "Your device is covered for hardware repairs.")
        screen.see_gone("Agreements")
        self.assertIsNone(screen.find("Get Support"))
        rows = [name for role, name, _ in screen.all() if role == "list item"]
        self.assertEqual(rows[-3:], ["Maya's Phone", "Maya's Watch", "Watch Mini"])  # the list comes after the detail

        place.stop_agent()
        screen.see("Coverage Service Not Running. What is shown was known before.")
        screen.see("Better <Warranty> & More")
        place.write_profile((r"^name = \"Maya's Phone\"", 'name = "A <b>& B"'))
        place.start_agent()
        screen.title("A <b>& B")
        wait("the notice gone", lambda: not screen.find("Coverage Service Not Running"))

        self.assertEqual(len(place.refresh()), 2)
        place.write_profile((r"^\[account\]\nidentifier.*\nalt_dsid.*", ""), (r"^credential_helper.*", ""))
        screen.title("Not Signed In")

    def test_refresh_without_the_server_keeps_the_offer(self):
        place = self.place
        place.begin()
        place.post_offer()
        screen = self.open_page()
        screen.see("Add QX Coverage")
        place.stop(place.server)
        screen.press("Refresh")
        screen.see("Not everything could be refreshed")
        self.assertTrue(self.has_offer())
        screen.see("Add QX Coverage", "Limited Warranty")

        # Only when each device has a record, the offer follows them.
        place.start_server(place.url.rsplit(":", 1)[1])
        place.serve(PHONE, featureToggleParameters={}, coverageLocalizedLabel="Plain Warranty")
        screen.press("Refresh")
        screen.see("Plain Warranty")
        self.assertTrue(self.has_offer())
        place.serve("VRXWATCH0002")
        screen.press("Refresh")
        screen.see_gone("Add QX Coverage")

    def test_status_pages(self):
        place = self.place
        screen = self.open_page()
        screen.title("Coverage Service Not Running")
        screen.see("systemctl --user start vrxagent")
        place.begin()
        screen.press("Try Again")
        screen.title("Maya's Phone")
        screen.show("VRXWATCH0002")
        screen.title("Watch Mini")
        screen.see("No Coverage Information")
        place.stop(self.page)

        (place.folder / "settings/bundle.toml").unlink()
        screen = self.open_page()
        screen.title("Not Allowed")
        screen.see("com.orvane.private.vrxagent")

    def test_narrow_in_japanese(self):
        place = self.place
        place.begin((r"^name = \"Maya's Phone\"", 'name = "電話"'))
        place.serve(PHONE, covered=False)
        place.refresh()
        screen = self.open_page(370, 730, LC_ALL=place.make_locale("ja_JP"))
        screen.title("保証")
        screen.see("保証対象外", "年", "日まで保証", "保証情報なし")
        screen.click("電話")
        screen.title("電話")
        screen.keys("Escape")
        screen.title("保証")
        screen.press("更新")
        screen.see("更新できなかった項目があります")


if __name__ == "__main__":
    unittest.main()
