#!/usr/bin/env python3
"""calmorph report in headless Chromium: drawn SVG, marked changes, escaping, big and tiny maps
and a screenshot that is not blank. Exit 77 (skipped) when no Chromium is installed."""
import os, re, shutil, struct, subprocess, sys, tempfile, urllib.parse, zlib

calmorph, data = sys.argv[1], sys.argv[2]
browser = next((shutil.which(b) for b in ("chromium", "chromium-browser", "google-chrome") if shutil.which(b)), None)
if not browser:
    print("SKIP: no Chromium found (install the Debian package chromium)")
    sys.exit(77)
tmp = tempfile.mkdtemp()
FLAGS = ["--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
         "--disable-background-networking", "--disable-component-update", "--disable-sync",
         "--user-data-dir=" + os.path.join(tmp, "profile")]
failures = []

def check(label, ok):
    if not ok: failures.append(label)

def report(*args):
    out = os.path.join(tmp, "r%d.html" % len(os.listdir(tmp)))
    subprocess.run([calmorph, "report", *args, "-o", out], check=True, stderr=subprocess.DEVNULL)
    return out

def dom(page, item):
    url = "file://" + page + "#item=" + urllib.parse.quote(item)
    return subprocess.run([browser, *FLAGS, "--dump-dom", url], capture_output=True, text=True,
                          timeout=120).stdout

diff = report(os.path.join(data, "new.cdf"), "--against", os.path.join(data, "old.cdf"))
hostile = '</script><img src=x onerror=alert(1)>&"Kurve"'
for item, expect in [
        ("Map", {'<rect class="cell': 12, '<rect class="cell changed"': 1, '<td class="changed"': 1}),
        (hostile, {'<circle class="pt': 5, '<circle class="pt changed"': 1, '<circle class="oldpt"': 5,
                   '&lt;/script&gt;&lt;img src=x onerror=alert(1)&gt;&amp;"Kurve"</span>': 2}),
        ("Descending", {'<circle class="pt': 2, '<path class="nonfinite"': 2, '<div class="note">Axis points are not strictly': 1}),
        ("OnePoint", {'<rect class="cell': 1}),
        ("Added", {'<div class="grid item st-added': 1, '<div class="grid item st-removed': 1})]:
    text = dom(diff, item)
    for needle, count in expect.items():
        check("%s: %s x%d, found %d" % (item, needle, count, text.count(needle)), text.count(needle) == count)
    check(item + ": markup from a text", "<img" not in text and '<b id="inj"' not in text)
    check(item + ": texts shown", "&lt;/b&gt; &amp; \"q\" Grüße" in text and "CRC matches" in text
          and "CRC differs" in text)

# A 500 x 500 map is drawn as one picture; its value table stops at 100 x 100.
n = 500
big = open(os.path.join(data, "new.cdf")).read().replace(
    "<NAME>OnePoint</NAME>", "<NAME>Big</NAME>").replace(
    '<AXIS size="1" sw-units="a" format-type="NUMERIC">5</AXIS>',
    '<AXIS size="%d" sw-units="a" format-type="NUMERIC">%s</AXIS>' % (n, " ".join(map(str, range(n))))).replace(
    '<AXIS size="1" sw-units="b" format-type="NUMERIC">7</AXIS>',
    '<AXIS size="%d" sw-units="b" format-type="NUMERIC">%s</AXIS>' % (n, " ".join(map(str, range(n))))).replace(
    'format-type="NUMERIC">3</VALUE>', 'format-type="NUMERIC">%s</VALUE>' % " ".join(str(i % 97) for i in range(n * n)))
open(os.path.join(tmp, "big.cdf"), "w").write(big)
text = dom(report(os.path.join(tmp, "big.cdf")), "Big")
table = text[text.find('id="valuetable"'):]
check("500x500 map drawn", text.count('<image class="cellimage"') == 1
      and table[:table.find("</table>")].count("<td") == 100 * 100)

shot = os.path.join(tmp, "shot.png")
subprocess.run([browser, *FLAGS, "--window-size=1280,900", "--screenshot=" + shot,
                "file://" + diff + "#item=Map"], capture_output=True, timeout=120)
png = open(shot, "rb").read() if os.path.exists(shot) else b""
chunks, pos = b"", 8
while pos < len(png):
    size, kind = struct.unpack(">I4s", png[pos:pos + 8])
    chunks += png[pos + 8:pos + 8 + size] if kind == b"IDAT" else b""
    pos += size + 12
check("screenshot has pictures", len(set(zlib.decompress(chunks))) > 64 if chunks else False)

shutil.rmtree(tmp)
print("\n".join(failures) or "report in Chromium: all checks passed")
sys.exit(1 if failures else 0)
