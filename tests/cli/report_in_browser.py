# The glucose report as a browser lays it out: headless Chromium renders each report at the printable
# width of A4 and of Letter paper (12 mm margins), and a test-only page around it (the report itself
# holds no script) checks that every section is there and that no element reaches past the page width.
#   report_in_browser.py VARNEL PROFILE...
# Exits 77 ("skipped") when no Chromium is installed.
import html
import json
import os
import shutil
import subprocess
import sys
import tempfile

SECTIONS = ["summary", "ranges", "over-time", "modal-day", "slots-section", "low-events", "treatment", "logbook"]
# Printable width in CSS pixels (96 per inch) of A4 (210 mm) and Letter (215.9 mm) less two 12 mm margins.
WIDTHS = {"A4": round((210 - 24) / 25.4 * 96), "Letter": round((215.9 - 24) / 25.4 * 96)}

MEASURE = """<script>
function measure(frame) {
  const doc = frame.contentDocument, width = doc.documentElement.clientWidth;
  const over = [...doc.body.querySelectorAll('*')].map(el => [el, el.getBoundingClientRect()])
    .filter(([el, box]) => box.width > 0 && box.right > width + 0.5).map(([el, box]) => el.tagName + ' ' + box.right);
  return {paper: frame.dataset.paper, width: width, scrollWidth: doc.documentElement.scrollWidth, over: over,
          sections: [...doc.querySelectorAll('section[id]')].map(s => s.id),
          headings: [...doc.querySelectorAll('h2')].map(h => h.textContent)};
}
const results = [];
for (const frame of document.querySelectorAll('iframe')) frame.addEventListener('load', () => {
  results.push(measure(frame));
  document.getElementById('result').textContent = JSON.stringify(results);
});
</script>"""


def chromium():
    return shutil.which("chromium") or shutil.which("chromium-browser")


def check(browser, report_html, work):
    frames = "".join(
        f'<iframe data-paper="{paper}" style="width:{width}px;height:40000px;border:0" '
        f'srcdoc="{html.escape(report_html, quote=True)}"></iframe>'
        for paper, width in WIDTHS.items())
    page = os.path.join(work, "page.html")
    with open(page, "w", encoding="utf-8") as f:
        f.write(f'<!DOCTYPE html><html><body><pre id="result"></pre>{frames}{MEASURE}</body></html>')
    profile = tempfile.mkdtemp(dir=work)
    out = subprocess.run(
        [browser, "--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
         "--disable-background-networking", "--disable-component-update", "--disable-sync",
         f"--user-data-dir={profile}", "--run-all-compositor-stages-before-draw", "--virtual-time-budget=20000",
         "--dump-dom", "file://" + page],
        capture_output=True, text=True, timeout=240)
    start = out.stdout.find('<pre id="result">')
    end = out.stdout.find("</pre>", start)
    if start < 0 or end < 0:
        return [f"the browser gave no page (exit {out.returncode}): {out.stderr[-2000:]}"]
    text = html.unescape(out.stdout[start + len('<pre id="result">'):end])
    results = json.loads(text) if text else []
    faults = [] if sorted(r["paper"] for r in results) == sorted(WIDTHS) else [f"measured only {results}"]
    for r in results:
        missing = [s for s in SECTIONS + ["Readings in ranges"] if s not in r["sections"] + r["headings"]]
        over = r["over"] + ([f"scrolls to {r['scrollWidth']}"] if r["scrollWidth"] > r["width"] else [])
        if missing or over:
            faults.append(f"{r['paper']} ({r['width']} px): missing {missing}, past the page width: {over[:10]}")
    return faults


def main():
    varnel, profiles = sys.argv[1], sys.argv[2:]
    browser = chromium()
    if not browser:
        print("skipped: no headless Chromium installed (chromium)")
        return 77
    faults = []
    with tempfile.TemporaryDirectory() as work:
        for profile in profiles:
            report = os.path.join(work, "report.html")
            subprocess.run([varnel, "report", "-q", "--sim-profile", profile, "-o", report], check=True, timeout=240)
            with open(report, encoding="utf-8") as f:
                faults += [f"{os.path.basename(profile)}: {fault}" for fault in check(browser, f.read(), work)]
    for fault in faults:
        print(fault)
    if not faults:
        print(f"report_in_browser: every section, nothing past {WIDTHS} px, for {len(profiles)} reports")
    return 1 if faults else 0


if __name__ == "__main__":
    sys.exit(main())
