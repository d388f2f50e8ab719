#!/usr/bin/env python3
"""Acceptance check of the direct label designer, the item list and the
direct page, run by hand.

Makes the demo company and a data folder through the headless host, then:
- lays out the label in the designer with the host's verbs (a confirmation
  with a bad box first, which must change nothing), saves the general
  settings and compares the nine stored sections with a model of the dialog
  of its own;
- shows the item list for marked items whose names need escaping and
  compares the page, line by line, with what it works out from the items
  database;
- prints the items as direct labels, one with a barcode the symbology refuses
  and one with none, renders a copy of the page in headless Chromium and
  counts the pictures the browser could not show.

    python3 acceptance/labdef_check.py [--cli build/app/tagora-cli] [--keep DIR]

Exit status 0 when everything agrees, 1 otherwise.
Python 3 standard library only; Chromium is needed for the last part.
"""

import configparser
import html
import os
import re
import shutil
import sqlite3
import subprocess
import sys

from checkrun import check_arguments, finish, private_host, run_cli

LINE_KEYS = ["UseCell", "FldID", "ViewType", "Align", "Font", "FontSize", "FontWeight", "FontUL",
             "FontItalic", "Direction", "Prefix", "Height", "Border"]
LINE_DEFAULTS = {"UseCell": "0", "FldID": "-1", "ViewType": "0", "Align": "1", "Font": "0", "FontSize": "9",
                 "FontWeight": "0", "FontUL": "0", "FontItalic": "0", "Direction": "1", "Prefix": "",
                 "Height": "0", "Border": "0"}
BAR_DEFAULTS = {"BarType": "0", "BarHeight": "0.4", "C128User": "0", "C39Ascii": "0", "DimX": "0.01",
                "LeftLen": "0", "LeftPrefix": "", "UserResoX": "100", "UserResoY": "50",
                "WideBarRatio": "2.2", "CheckDigit": "-1", "ShowDesc": "0"}
PAGE_DEFAULTS = {"PageCols": "4", "PageRows": "6", "PageAutoPrint": "0", "MaxTextLen": "0", "LabTop": "0",
                 "LabBottom": "0"}
# Row controls of the first and third tabs and the layout key each one edits.
ROW_CONTROLS = {"chkXCell": "UseCell", "cmbXFld": "FldID", "cmbVType": "ViewType", "CmbFont": "Font",
                "txtFontSize": "FontSize", "CmbWeight": "FontWeight", "ChkUL": "FontUL",
                "ChkItalic": "FontItalic", "CmbAlign": "Align", "CmbDirection": "Direction",
                "txtPrefix": "Prefix", "txtHeight": "Height", "ChkBorder": "Border"}
SINGLE_CONTROLS = {"cmbXBarType": ("LabelBar", "BarType"), "txtXBarH": ("LabelBar", "BarHeight"),
                   "txtXBarLeftLen": ("LabelBar", "LeftLen"), "txtXLeftPrefix": ("LabelBar", "LeftPrefix"),
                   "txtUserResoX": ("LabelBar", "UserResoX"), "txtUserResoY": ("LabelBar", "UserResoY"),
                   "chkCDigit": ("LabelBar", "CheckDigit"), "ChkShowDesc": ("LabelBar", "ShowDesc"),
                   "txtDimX": ("LabelBar", "DimX"), "txtWideBarRatio": ("LabelBar", "WideBarRatio"),
                   "txtCols": ("DirectLabel", "PageCols"), "txtRows": ("DirectLabel", "PageRows"),
                   "chkOpenPrintDlg": ("DirectLabel", "PageAutoPrint"),
                   "txtMaxTextLen": ("DirectLabel", "MaxTextLen"), "txtLabTop": ("DirectLabel", "LabTop"),
                   "txtLabBottom": ("DirectLabel", "LabBottom")}
SECTIONS = [f"LabelDef{i}" for i in range(7)] + ["LabelBar", "DirectLabel"]


def read_layout(ini):
    """The nine sections as stored, a missing key read as its default."""
    parser = configparser.RawConfigParser()
    parser.optionxform = str
    parser.read(ini, encoding="utf-8")
    layout = {}
    for s in SECTIONS:
        defaults = LINE_DEFAULTS if s.startswith("LabelDef") else BAR_DEFAULTS if s == "LabelBar" else PAGE_DEFAULTS
        stored = dict(parser[s]) if parser.has_section(s) else {}
        layout[s] = {k: stored.get(k, d) for k, d in defaults.items()}
    return layout


class DesignerModel:
    """The dialog's controls as a user leaves them, and what confirming
    makes of the layout it opened with."""

    def __init__(self, layout):
        self.opened = layout
        self.rows = [dict(layout[f"LabelDef{i}"]) for i in range(7)]
        self.single = {c: layout[s][k] for c, (s, k) in SINGLE_CONTROLS.items()}
        self.verbs = []

    def set_row(self, control, row, value):
        self.verbs += ["set", f"{control}({row})", value]
        key = ROW_CONTROLS[control]
        # A ticked box is true (-1); clear and grey are both false.
        self.rows[row][key] = {"1": "-1", "0": "0", "2": "0"}[value] if control[:3] in ("chk", "Chk") else value

    def set_single(self, control, value):
        self.verbs += ["set", control, value]
        self.single[control] = {"1": "-1", "0": "0", "2": "0"}[value] if control[:3] in ("chk", "Chk") else value

    def move(self, src, dst):
        self.rows[dst] = dict(self.rows[src])
        # Cleaning leaves the field list with nothing chosen: confirming then
        # keeps the row's field as the layout had it.
        self.rows[src].update(UseCell="0", FldID=None, ViewType="0")

    def insert(self, row):
        self.verbs += ["click", f"lblAdd({row})"]
        for k in range(5, row - 1, -1) if row < 6 else []:
            self.move(k, k + 1)

    def remove(self, row):
        self.verbs += ["click", f"lblDel({row})"]
        for k in range(row, 6) if row < 6 else []:
            self.move(k + 1, k)

    def confirmed(self):
        result = {s: dict(v) for s, v in self.opened.items()}
        for i, row in enumerate(self.rows):
            for k, v in row.items():
                if v is not None:
                    result[f"LabelDef{i}"][k] = v
        for c, (s, k) in SINGLE_CONTROLS.items():
            result[s][k] = self.single[c]
        return result


def compare_layouts(label, got, want):
    diffs = 0
    for s in SECTIONS:
        for k, v in want[s].items():
            if got[s].get(k) != v:
                print(f"  {label}: [{s}] {k} is {got[s].get(k)!r}, expected {v!r}")
                diffs += 1
    return diffs


def check_designer(cli, env, ini):
    summary = []
    r = run_cli(cli, env, ini, ["set", "OptOLE(3)", "True", "click", "cmdSaveDef1"])
    before = read_layout(ini)

    # A bad box: confirming refuses, names the box, and the dialog changes nothing.
    m = DesignerModel(before)
    m.set_row("chkXCell", 5, "1")
    m.set_row("txtPrefix", 0, "changed")
    m.set_row("txtFontSize", 3, "x")
    m.set_single("txtCols", "2")
    r = run_cli(cli, env, ini, ["click", "cmdLabDesign"] + m.verbs + ["click", "cmdClose", "click", "cmdCancel",
                                                                       "click", "cmdSaveDef1"])
    diffs = compare_layouts("bad box", read_layout(ini), before)
    if "תקלה" not in r.stderr or '"x"' not in r.stderr:
        print(f"  bad box: no fault naming the box: {r.stderr.strip()!r}")
        diffs += 1
    summary.append(("designer: a bad box changes nothing", diffs))

    # A layout: three lines, a line inserted above the barcode and the first removed.
    m = DesignerModel(before)
    for row in range(7):
        m.set_row("chkXCell", row, "0")
    m.set_row("chkXCell", 0, "1")
    m.set_row("cmbXFld", 0, "2")
    m.set_row("txtPrefix", 0, "קוד: A&B <'\"")
    m.set_row("chkXCell", 1, "1")
    m.set_row("cmbXFld", 1, "1")
    m.set_row("cmbVType", 1, "0")
    m.set_row("CmbAlign", 1, "2")
    m.set_row("CmbDirection", 1, "0")
    m.set_row("chkXCell", 2, "1")
    m.set_row("cmbXFld", 2, "4")
    m.set_row("cmbVType", 2, "1")
    m.set_row("CmbFont", 2, "1")
    m.set_row("txtFontSize", 2, "12")
    m.set_row("CmbWeight", 2, "2")
    m.set_row("ChkItalic", 2, "2")
    m.set_row("ChkUL", 2, "1")
    m.set_row("txtHeight", 2, "14")
    m.set_row("ChkBorder", 2, "1")
    m.insert(2)
    m.remove(0)
    m.insert(6)
    m.remove(6)
    m.set_single("cmbXBarType", "6")
    m.set_single("txtXBarH", "0.5")
    m.set_single("txtDimX", "0.02")
    m.set_single("txtWideBarRatio", "2.5")
    m.set_single("txtUserResoX", "0")
    m.set_single("txtUserResoY", "0")
    m.set_single("chkCDigit", "1")
    m.set_single("ChkShowDesc", "1")
    m.set_single("txtCols", "3")
    m.set_single("txtRows", "8")
    m.set_single("chkOpenPrintDlg", "0")
    m.set_single("txtLabTop", "5")
    m.set_single("txtLabBottom", "-1")
    m.set_single("txtMaxTextLen", "30")
    m.set_single("txtXLeftPrefix", "")
    r = run_cli(cli, env, ini, ["click", "cmdLabDesign"] + m.verbs + ["click", "cmdClose", "click", "cmdSaveDef1"])
    diffs = compare_layouts("layout", read_layout(ini), m.confirmed())
    if r.stderr.strip():
        print(f"  layout: the host said {r.stderr.strip()!r}")
        diffs += 1
    summary.append(("designer: the stored layout follows the dialog", diffs))
    return summary


# ------------------------------------------------------------ the item list

HEAD = ["<HTML>", "<HEAD>", "<TITLE>רשימת פריטים להדפסה</TITLE>",
        "<meta http-equiv='Content-Type' content='text/html; charset=windows-1255'>", "<style>",
        " .Title1 {font-size : 9pt; color: blue; font-family: Arial; font-weight : bold;}",
        " .TDCaption {font-size : 8pt; color: white; background: blue; font-family: Arial; font-weight : bold;}",
        " TD {font-size : 8pt; color: black; font-family: Arial; text-align:right}",
        " TR {text-align:right}", "</style>", "</HEAD>", "<BODY BGCOLOR='#FFFFFF'>"]

# Marked items: (name, price, copies, barcode); None leaves the demo's value.
MARKED = [("<b>", 12, 2, None), ('A&B "q" \'x\'', 3.5, 1, "ABC"), ("פריט & <i>", None, 3, ""),
          (None, 1234.5, 1, None)]


def mark_items(data):
    db = sqlite3.connect(os.path.join(data, "tgrmitm.tdb"))
    keys = [k for (k,) in db.execute("SELECT ItemKey FROM tItems ORDER BY ItemKey")][:len(MARKED)]
    db.execute("UPDATE tItems SET PrintLabel = 0")
    for key, (name, price, copies, barcode) in zip(keys, MARKED):
        db.execute("UPDATE tItems SET PrintLabel = 1, Copies = ?, Price = ? WHERE ItemKey = ?", (copies, price, key))
        if name is not None:
            db.execute("UPDATE tItems SET ItemName = ? WHERE ItemKey = ?", (name, key))
        if barcode is not None:
            db.execute("UPDATE tItems SET BarCode = ? WHERE ItemKey = ?", (barcode, key))
    db.commit()
    rows = db.execute("SELECT ItemKey, ItemName, Unit, Price, Copies, BarCode FROM tItems WHERE PrintLabel = 1"
                      " ORDER BY ItemKey COLLATE NOCASE DESC").fetchall()
    db.close()
    return rows


def check_list(cli, env, ini, items, temp):
    sent = {0: "1", 1: "1", 5: "2", 6: "1"}  # row 5 grey: it counts as sent
    verbs = ["set", "OptPrinter(1)", "True", "set", "txtPriceFormat", "", "set", "ChkUseAccountKey", "0"]
    for row in range(38):
        verbs += ["set", f"ChkFldSend({row})", sent.get(row, "0")]
    r = run_cli(cli, env, ini, [v for row in sorted(sent) for v in ("get", f"LblFldDesc({row}).Caption")])
    captions = r.stdout.strip().splitlines()[-len(sent):]
    r = run_cli(cli, env, ini, verbs + ["click", "cmdPreview(1)"])
    page = os.path.join(temp, "tgrlab", "tgrlab2.htm")
    diffs = 0
    if r.stderr.strip() or not os.path.exists(page):
        print(f"  list: no page ({r.stderr.strip()!r})")
        return [("item list", 1)]
    raw = open(page, "rb").read()
    if raw.count(b"\r\n") != raw.count(b"\n"):
        print("  list: a line does not end with CR LF")
        diffs += 1
    lines = raw.decode("cp1255").split("\r\n")
    want = HEAD + ["<p class=Title1 align='center'>רשימת פריטים ונתונים להדפסה</p>",
                   "<table width='100%' border='0' cellpadding='1' cellspacing='1' dir='rtl'>", " <tr>"]
    want += [f"  <td class=TDCaption>{c}</td>" for c in captions]
    want += ["  <td class=TDCaption>עותקים</td>", " </tr>"]
    cells = []
    for key, name, unit, price, copies, _ in items:
        values = [key, name, unit or "", "" if price is None else f"{price:.2f}"]
        want.append(" <tr>")
        cells += [(len(want) + i, v) for i, v in enumerate(values)]
        want += [None] * len(values)
        want += [f"  <td>{copies}</td>", " </tr>"]
    want += ["</table>", "</BODY>", "</HTML>", ""]
    if len(lines) != len(want):
        print(f"  list: {len(lines)} lines, expected {len(want)}")
        diffs += 1
    for n, (got, w) in enumerate(zip(lines, want)):
        if w is not None and got != w:
            print(f"  list line {n + 1}: {got!r}, expected {w!r}")
            diffs += 1
    # Values: the cell shows the value as typed, and no markup of its own.
    for n, value in cells:
        got = lines[n] if n < len(lines) else ""
        m = re.fullmatch(r"  <td>(.*)</td>", got)
        if not m or "<" in m.group(1) or html.unescape(m.group(1)) != value \
                or re.search(r"&(?![a-z]+;|#\d+;)", m.group(1)):
            print(f"  list line {n + 1}: {got!r} does not show {value!r}")
            diffs += 1
    return [("item list: the page, its columns and escaped values", diffs)]


# ------------------------------------------------------------ the direct page

PROBE = """
<script>
window.addEventListener('load', function () {
  var imgs = document.images, broken = 0;
  for (var i = 0; i < imgs.length; i++)
    if (!imgs[i].complete || imgs[i].naturalWidth === 0) broken++;
  // A sheet's unused places are empty labels; they are not counted.
  var labels = 0;
  document.querySelectorAll('table.Lab').forEach(function (t) {
    if (t.textContent.trim() !== '' || t.querySelector('img')) labels++;
  });
  document.body.setAttribute('data-probe', 'labels=' + labels + ' images=' + imgs.length + ' broken=' + broken);
});
</script>
"""


def check_direct(cli, env, ini, items, work):
    chromium = shutil.which("chromium") or shutil.which("chromium-browser")
    if not chromium:
        print("  direct page: Chromium is not installed")
        return [("direct page: no broken picture", 1)]
    # The stored layout is the one the designer part left: a text line and an EAN-13 line.
    r = run_cli(cli, env, ini, ["set", "OptOLE(3)", "True", "click", "cmdPrintItmes"])
    m = re.search(r"^page: (.*)$", r.stdout, re.M)
    if not m:
        print(f"  direct page: none shown ({r.stderr.strip()!r})")
        return [("direct page: no broken picture", 1)]
    diffs = 0
    if "ABC" not in r.stderr:
        print(f"  direct page: the refused barcode was not reported ({r.stderr.strip()!r})")
        diffs += 1
    # A copy of the job, so the probe never touches what the host wrote.
    copy = os.path.join(work, "render")
    shutil.copytree(os.path.dirname(m.group(1)), copy)
    page = os.path.join(copy, os.path.basename(m.group(1)))
    with open(page, "ab") as f:
        f.write(PROBE.encode("ascii"))
    out = subprocess.run([chromium, "--headless", "--no-sandbox", "--disable-gpu", "--no-first-run",
                          f"--user-data-dir={os.path.join(work, 'profile')}", "--virtual-time-budget=10000",
                          "--dump-dom", "file://" + page], capture_output=True, text=True, timeout=300)
    probe = re.search(r'data-probe="labels=(\d+) images=(\d+) broken=(\d+)"', out.stdout)
    if not probe:
        print("  direct page: the browser did not finish the page")
        return [("direct page: no broken picture", diffs + 1)]
    labels, images, broken = (int(g) for g in probe.groups())
    # One label per copy; a picture on each label whose barcode EAN-13 takes.
    want_labels = sum(copies for *_, copies, _ in items)
    want_images = sum(copies for *_, copies, bar in items if re.fullmatch(r"\d{12,13}", bar or ""))
    if broken or labels != want_labels or images != want_images:
        print(f"  direct page: {labels} labels, {images} pictures, {broken} broken;"
              f" expected {want_labels} labels, {want_images} pictures")
        diffs += 1
    return [("direct page: no broken picture", diffs)]


def main():
    args, work = check_arguments(__doc__, "labdef-check-")
    env, ini, temp = private_host(work)
    demo = os.path.join(work, "demo")
    r = run_cli(args.cli, env, ini, ["--demo", demo])
    r = run_cli(args.cli, env, ini, ["set", "cmbPriceField", "1", "click", "cmdSaveDef2", "click", "CmdImportItems"])
    data = os.path.join(demo, "data")
    if not os.path.exists(os.path.join(data, "tgrmitm.tdb")):
        print(f"no data folder: {r.stderr}")
        return 1
    summary = check_designer(args.cli, env, ini)
    items = mark_items(data)
    summary += check_list(args.cli, env, ini, items, temp)
    summary += check_direct(args.cli, env, ini, items, work)
    return finish(summary, work, bool(args.keep))


if __name__ == "__main__":
    sys.exit(main())
