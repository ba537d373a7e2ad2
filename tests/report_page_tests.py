#!/usr/bin/env python3
"""The page that `tsd report` writes, in a browser. Says so where there is none, and does not fail.

usage: report_page_tests.py TSD [unittest arguments]

With the variable REPORT_PICTURES the pictures of the page at several sizes go to that folder.
"""

import os
import pathlib
import plistlib
import sys

import browser
import tsd_folder
from tsd_folder import SOME_FAILED, Folder

FRAME = "new Promise(done => requestAnimationFrame(() => requestAnimationFrame(() => done())))"
HOSTILE = '</script><script>document.title="taken"</script><img src=x onerror=alert(1)>"\'\u202egnp.exe&amp;'

# Contrast of every text that is seen with what it stands on, the least first.
CONTRASTS = """(() => {
  const parse = (text) => (text.match(/[\\d.]+/g) || []).map(Number);
  const light = ([r, g, b]) => [r, g, b].map(c => c / 255).map(c => c <= 0.03928 ? c / 12.92 : ((c + 0.055) / 1.055) ** 2.4)
    .reduce((sum, c, i) => sum + c * [0.2126, 0.7152, 0.0722][i], 0);
  const found = [];
  for (const element of document.querySelectorAll("body *")) {
    const own = [...element.childNodes].some(node => node.nodeType === 3 && node.data.trim());
    if (!own || !element.getClientRects().length || element.closest(".skip, script, noscript")) continue;
    let ground = element;
    while (ground && (parse(getComputedStyle(ground).backgroundColor)[3] ?? 1) < 1) ground = ground.parentElement;
    const colours = [getComputedStyle(element).color, getComputedStyle(ground || document.body).backgroundColor];
    const [high, low] = colours.map(each => light(parse(each))).sort((a, b) => b - a);
    found.push([(high + 0.05) / (low + 0.05), element.outerHTML.slice(0, 90)]);
  }
  return found.sort((a, b) => a[0] - b[0])[0];
})()"""


class ReportPage(Folder):
    def setUp(self):
        super().setUp()
        self.browser = browser.Browser()
        self.addCleanup(self.browser.close)

    def open(self, width=1280, dark=False, subject="dev"):
        self.tsd("report", subject, "-o", "report.html")
        self.browser.look(width, dark=dark)
        self.browser.requests.clear()
        self.browser.open("report.html")
        self.assertEqual(self.browser.ask("document.documentElement.dataset.ready"), "yes", self.browser.complaints)

    def text(self, selector):
        return self.browser.ask(f"document.querySelector({selector!r}).textContent")

    def type(self, field, text):
        self.browser.ask(f"(() => {{ const field = document.getElementById({field!r}); field.value = {text!r};"
                         f"field.dispatchEvent(new Event(field.tagName === 'SELECT' ? 'change' : 'input')); }})()")
        self.browser.ask(FRAME)

    def settled(self):
        self.assertEqual(self.browser.complaints, [])
        self.assertEqual({url.split(":")[0] for url in self.browser.requests} - {"data"}, {"file"})
        self.assertEqual(len([url for url in self.browser.requests if url.startswith("file")]), 1)

    def test_shows_filters_and_zooms(self):
        apps = self.make(6)
        pathlib.Path(f"host/Packages/{apps[2]}.pkg").write_bytes(b"no archive")
        self.sync("dev", "host", code=SOME_FAILED)
        self.open()
        self.assertEqual(self.text("#sentence"), "The sync is not complete: 5 of 6 apps in order, 1 failed.")
        self.assertRegex(self.text("#facts"), r"Resultnot completeExit code3Took\d+\.\d\d s$")
        self.assertEqual(self.text("#app-count"), "6 of 6 apps")
        self.type("app-outcome", "failed")
        self.assertEqual(self.text("#app-count"), "1 of 6 apps")
        self.browser.ask("document.getElementById('app-list').focus()")
        self.browser.press("ArrowDown")
        self.assertEqual(self.text("#story-id"), apps[2])
        self.assertRegex(self.text("#story-events"), "damaged|archive")
        self.browser.ask("document.getElementById('story-journal').click()")
        self.assertRegex(self.text("#call-count"), r"^(?!0 )[\d,]+ of [\d,]+ records$")
        self.type("call-kind", "wrong")
        self.assertIn("RVAppInstallCoordinator.error", self.text("#call-list"))
        self.type("call-search", "no such thing anywhere")
        self.assertRegex(self.text("#call-count"), "^0 of ")
        self.browser.ask("document.documentElement.style.scrollBehavior = 'auto';"
                         "document.getElementById('timeline').scrollIntoView()")
        self.browser.ask(FRAME)
        self.assertEqual(self.text("nav [aria-current]"), "Timeline")
        before = self.text("#span")
        self.browser.ask("document.getElementById('zoom-in').click()")
        self.browser.ask(FRAME)
        closer = self.text("#span")
        self.assertNotEqual(closer, before)
        self.browser.ask("document.getElementById('chart').focus()")
        self.browser.press("0")
        self.browser.ask(FRAME)
        self.assertEqual(self.text("#span"), before)
        self.settled()

    def test_text_stays_text(self):
        apps = self.make(3)
        manifest = pathlib.Path(f"host/{apps[0]}/Info.plist")
        content = plistlib.loads(manifest.read_bytes())
        content["KBBundleDisplayName"] = HOSTILE
        manifest.write_bytes(plistlib.dumps(content))
        pathlib.Path(f"host/Packages/{apps[0]}.pkg").unlink()
        self.sync("dev", "host", "--end-phase", "success", code=SOME_FAILED)
        self.open()
        self.assertIn("dev", self.browser.ask("document.title"))
        seen = self.text("#pages")
        self.assertIn('</script><script>document.title="taken"</script>', seen)
        self.assertNotIn("\u202e", self.browser.ask("document.body.innerText"))
        self.assertEqual(self.browser.ask("document.querySelectorAll('main script, main img[onerror]').length"), 0)
        self.settled()

    def test_sizes_and_contrast(self):
        apps = self.make(5)
        pathlib.Path(f"host/Packages/{apps[2]}.pkg").write_bytes(b"no archive")
        self.sync("dev", "host", "--inject", f"transfer:{apps[3]}@3=none", "--end-phase", "success", code=SOME_FAILED)
        pictures = os.environ.get("REPORT_PICTURES")
        for width in [390, 1280]:
            for dark in [False, True]:
                with self.subTest(width=width, dark=dark):
                    self.open(width, dark)
                    self.browser.ask("document.querySelector('.icon button').click()")
                    self.browser.ask(FRAME)
                    self.assertLessEqual(self.browser.ask("document.documentElement.scrollWidth"), width)
                    ratio, where = self.browser.ask(CONTRASTS)
                    self.assertGreaterEqual(ratio, 4.5, where)
                    if pictures:
                        self.browser.ask("scrollTo(0, 0)")
                        height = self.browser.ask("document.documentElement.scrollHeight")
                        self.browser.look(width, height, dark)
                        self.browser.ask(FRAME)
                        self.browser.screenshot(pathlib.Path(pictures) / f"{width}-{'dark' if dark else 'light'}.png")
        roles = self.browser.ask("[...document.querySelectorAll('header, nav, main, footer')].map(e => e.tagName)")
        self.assertEqual(roles, ["HEADER", "NAV", "MAIN", "FOOTER"])
        unnamed = self.browser.ask("[...document.querySelectorAll('button, input, select')].filter(e => "
                                   "!e.textContent.trim() && !e.ariaLabel && !e.labels?.length).map(e => e.outerHTML)")
        self.assertEqual(unnamed, [])
        self.settled()

    def test_a_journal_that_was_cut(self):
        self.make(2)
        self.sync("dev", "host")
        path = pathlib.Path("dev/runs/0001-sync/calls.jsonl")
        lines = path.read_text().splitlines()
        note = '{"note":"the journal is cut off here, as it has become too long"}'
        hours = lines[len(lines) // 2].replace('"t":', '"t":72', 1)
        path.write_text("\n".join([*lines[:len(lines) // 2], hours, note, ""]))
        self.open()
        self.assertRegex(self.text("#cut"), r"come to its size limit at (\d+ min )?\d+\.\d{3} s: what came later is not drawn")
        self.assertNotIn("Took", self.text("#facts"))
        self.settled()

    def test_a_recording(self):
        self.make(2)
        self.sync("dev", "host", "--record", "sync.recording")
        self.open(subject="sync.recording")
        self.assertEqual(self.text("#sentence"), "What was recorded: 2 of 2 apps in order.")
        self.assertEqual(self.browser.ask("document.querySelector('#home, nav a[href=\\'#home\\'], #settings')"), None)
        self.assertRegex(self.text("#call-count"), r"^(?!0 )[\d,]+ of [\d,]+ records$")
        self.settled()

    def test_many_apps_take_few_elements(self):
        self.make(300, "dev", "--package-size", "0")
        self.sync("dev", "host")
        self.open()
        self.assertEqual(self.text("#app-count"), "300 of 300 apps")
        self.assertLess(self.browser.ask("document.querySelectorAll('*').length"), 1500)
        self.browser.ask("document.getElementById('app-list').focus()")
        self.browser.press("End")
        self.assertEqual(self.browser.ask("document.querySelector('#app-list .row[aria-selected=true]').ariaPosInSet"), "300")
        self.settled()


if __name__ == "__main__":
    if not browser.program():
        print("there is no chromium here: the report's page is not tested ('.ci/packages report' installs it)")
        sys.exit(0)
    tsd_folder.main()
