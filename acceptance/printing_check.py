#!/usr/bin/env python3
"""Acceptance check of printing on Linux, run by hand.

Makes the demo company and a data folder through the headless host, marks
three items with copies 2, 1 and 3, starts a CUPS server of its own on
loopback (scripts/cups-test-server.sh) with a queue that keeps the bytes of
each job, and prints the items from the print button three ways:
- through the gLabels bridge into the queue: the PDF must have one page per
  label, in order, each with its item's key and a barcode that decodes to the
  item's;
- through the ZPL bridge to a listener of its own: one format per item with
  its copies in ^PQ, the barcode field holding the item's barcode, the key,
  and the Hebrew name in visual order;
- as direct labels with "print automatically" on: the PDF the queue gets
  must decode to the three barcodes.

    python3 acceptance/printing_check.py [--cli build/app/tagora-cli] [--keep DIR] [--port N]

Exit status 0 when everything agrees, 1 otherwise. Python 3 standard
library; cupsd, glabels-3-batch, chromium, pdftotext, pdftoppm, pdfinfo and
zbarimg must be installed (scripts/setup.sh installs them).
"""

import glob
import os
import re
import socket
import sqlite3
import subprocess
import sys
import threading
import time

from checkrun import check_arguments, finish, private_host, replace_section, run_cli

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
COPIES = [2, 1, 3]
SENT_ROWS = {0: "ItemKey", 1: "ItemName", 4: "BarCode", 6: "Price"}


def ean13_ok(code):
    if not re.fullmatch(r"\d{13}", code or ""):
        return False
    total = sum(int(c) * (3 if i % 2 else 1) for i, c in enumerate(code[:12]))
    return (10 - total % 10) % 10 == int(code[12])


def mark_items(data):
    """Three items with valid EAN-13 barcodes and a Hebrew name, marked in key order."""
    db = sqlite3.connect(os.path.join(data, "tgrmitm.tdb"))
    rows = db.execute("SELECT ItemKey, ItemName, BarCode FROM tItems ORDER BY ItemKey COLLATE NOCASE").fetchall()
    chosen = [r for r in rows if ean13_ok(r[2]) and re.search("[\u05d0-\u05ea]", r[1] or "")][:3]
    db.execute("UPDATE tItems SET PrintLabel = 0")
    for (key, _, _), copies in zip(chosen, COPIES):
        db.execute("UPDATE tItems SET PrintLabel = 1, Copies = ? WHERE ItemKey = ?", (copies, key))
    db.commit()
    db.close()
    return chosen


def field_verbs(printer, option, label=None):
    verbs = ["set", option, "True", "set", "OptPrinter(0)", "True"]
    if printer:
        verbs += ["set", "cmbPrinter", printer]
    if label:
        verbs += ["set", "lblLabelName(1)", label]
    for row in range(38):
        verbs += ["set", f"ChkFldSend({row})", "1" if row in SENT_ROWS else "0"]
    return verbs


def set_automation(ini, lines):
    replace_section(ini, "Automation", lines)


def run(args):
    return subprocess.run(args, capture_output=True, text=True, timeout=300).stdout


def wait_for_job(out_file, env):
    for _ in range(300):
        idle = run(["lpstat", "-h", env["CUPS_SERVER"], "-o", "tagora-pdf"]).strip() == ""
        if idle and os.path.exists(out_file) and os.path.getsize(out_file) > 0:
            return True
        time.sleep(0.1)
    return False


def decode_pages(pdf, work, name):
    for old in glob.glob(os.path.join(work, name + "*.png")):
        os.remove(old)
    run(["pdftoppm", "-r", "300", "-png", pdf, os.path.join(work, name)])
    return [run(["zbarimg", "-q", p]).split() for p in sorted(glob.glob(os.path.join(work, name + "*.png")))]


def check_glabels(cli, env, ini, demo, items, out_file, work):
    set_automation(ini, ["Bridge=glabels", "Timeout=60"])
    if os.path.exists(out_file):
        os.remove(out_file)
    r = run_cli(cli, env, ini, field_verbs("tagora-pdf", "OptOLE(0)", os.path.join(demo, "labels", "demo-item.glabels"))
                + ["click", "cmdPrintItmes"])
    diffs = 0
    if r.stderr.strip() or not wait_for_job(out_file, env):
        print(f"  gLabels: no job ({r.stderr.strip()!r})")
        return [("gLabels bridge into the queue", 1)]
    pages = run(["pdfinfo", out_file])
    count = int(re.search(r"Pages:\s+(\d+)", pages).group(1)) if "Pages:" in pages else 0
    want = [item for item, copies in zip(items, COPIES) for _ in range(copies)]
    if count != len(want):
        print(f"  gLabels: {count} pages, expected {len(want)}")
        diffs += 1
    texts = run(["pdftotext", "-layout", out_file, "-"]).split("\f")
    codes = decode_pages(out_file, work, "glabels")
    for i, (key, _, barcode) in enumerate(want):
        if i >= len(texts) or key not in texts[i]:
            print(f"  gLabels page {i + 1}: the key {key} is not on it")
            diffs += 1
        if i >= len(codes) or codes[i] != [f"EAN-13:{barcode}"]:
            print(f"  gLabels page {i + 1}: barcodes {codes[i] if i < len(codes) else None}, expected {barcode}")
            diffs += 1
    return [("gLabels bridge into the queue: pages, texts, barcodes", diffs)]


class Listener(threading.Thread):
    def __init__(self):
        super().__init__(daemon=True)
        self.server = socket.socket()
        self.server.bind(("127.0.0.1", 0))
        self.server.listen(4)
        self.port = self.server.getsockname()[1]
        self.data = b""

    def run(self):
        while True:
            try:
                conn, _ = self.server.accept()
            except OSError:
                return
            with conn:
                while chunk := conn.recv(65536):
                    self.data += chunk


def unhex(text, indicator):
    return re.sub(re.escape(indicator) + r"([0-9A-Fa-f]{2})", lambda m: chr(int(m.group(1), 16)), text)


def hebrew_letters(text):
    return "".join(c for c in text if "\u05d0" <= c <= "\u05ea")


def check_zpl(cli, env, ini, demo, items):
    listener = Listener()
    listener.start()
    set_automation(ini, ["Bridge=zpl", f"ZplHost=127.0.0.1:{listener.port}", "Timeout=30"])
    r = run_cli(cli, env, ini, field_verbs(None, "OptOLE(0)", os.path.join(demo, "labels", "demo-item.zpl"))
                + ["click", "cmdPrintItmes"])
    time.sleep(0.5)
    listener.server.close()
    diffs = 0
    formats = [f for f in listener.data.decode("utf-8", "replace").split("^XZ") if f.strip()]
    if r.stderr.strip() or len(formats) != len(items):
        print(f"  ZPL: {len(formats)} formats ({r.stderr.strip()!r})")
        return [("ZPL bridge to a printer's port", 1)]
    for fmt, (key, name, barcode), copies in zip(formats, items, COPIES):
        fields = [unhex(m.group(2), m.group(1) or "_") for m in
                  re.finditer(r"(?:\^FH(.)?)?\^FD(.*?)\^FS", fmt)]
        problems = []
        if "^CI28" not in fmt:
            problems.append("no ^CI28")
        if f"^PQ{copies}" not in fmt:
            problems.append(f"no ^PQ{copies}")
        if barcode not in fields:
            problems.append(f"no barcode field {barcode}")
        if not any(key in f for f in fields):
            problems.append(f"no key {key}")
        hebrew = [f for f in fields if hebrew_letters(f)]
        if not hebrew or hebrew_letters(hebrew[0]) != hebrew_letters(name)[::-1]:
            problems.append(f"the name {name!r} is not in visual order: {hebrew}")
        if problems:
            print(f"  ZPL {key}: " + "; ".join(problems))
            diffs += 1
    return [("ZPL bridge to a printer's port: formats, copies, fields, visual order", diffs)]


def check_direct(cli, env, ini, items, out_file, work):
    set_automation(ini, ["Timeout=60"])
    if os.path.exists(out_file):
        os.remove(out_file)
    design = ["click", "cmdLabDesign"]
    for row in range(7):
        design += ["set", f"chkXCell({row})", "0"]
    design += ["set", "chkXCell(0)", "1", "set", "cmbXFld(0)", "4", "set", "cmbVType(0)", "1",
               "set", "chkXCell(1)", "1", "set", "cmbXFld(1)", "0", "set", "cmbVType(1)", "0",
               "set", "cmbXBarType", "2", "set", "txtUserResoX", "0", "set", "txtUserResoY", "0",
               "set", "txtDimX", "0.01", "set", "chkOpenPrintDlg", "1", "click", "cmdClose"]
    r = run_cli(cli, env, ini, field_verbs("tagora-pdf", "OptOLE(3)") + design + ["click", "cmdPrintItmes"])
    if re.search(r"^page: ", r.stdout, re.M) or not wait_for_job(out_file, env):
        print(f"  direct: no job in the queue ({r.stderr.strip()!r})")
        return [("direct labels printed as PDF without a dialog", 1)]
    found = {c for page in decode_pages(out_file, work, "direct") for c in page}
    want = {f"CODE-128:{barcode}" for _, _, barcode in items}
    diffs = 0 if want <= found else 1
    if diffs:
        print(f"  direct: decoded {sorted(found)}, expected {sorted(want)}")
    return [("direct labels printed as PDF without a dialog", diffs)]


def main():
    args, work = check_arguments(
        __doc__, "printing-check-", more=lambda ap: ap.add_argument("--port", type=int, default=63141))
    env, ini, temp = private_host(work)
    # cupsd writes the queue's file as its own user: it must be able to pass
    # through the work folder (mkdtemp makes it private).
    os.chmod(work, 0o711)
    cups = os.path.join(work, "cups")
    script = os.path.join(ROOT, "scripts", "cups-test-server.sh")
    subprocess.run(["bash", script, "start", cups, str(args.port)], check=True, timeout=120)
    try:
        env["CUPS_SERVER"] = f"127.0.0.1:{args.port}"
        demo = os.path.join(work, "demo")
        run_cli(args.cli, env, ini, ["--demo", demo])
        run_cli(args.cli, env, ini, ["set", "cmbPriceField", "1", "click", "cmdSaveDef2", "click", "CmdImportItems"])
        items = mark_items(os.path.join(demo, "data"))
        if len(items) < 3:
            print("the demo company has fewer than three items with a Hebrew name and an EAN-13")
            return 1
        out_file = os.path.join(cups, "out", "tagora-pdf")
        summary = check_glabels(args.cli, env, ini, demo, items, out_file, work)
        summary += check_zpl(args.cli, env, ini, demo, items)
        summary += check_direct(args.cli, env, ini, items, out_file, work)
    finally:
        subprocess.run(["bash", script, "stop", cups], timeout=120)
    return finish(summary, work, bool(args.keep))


if __name__ == "__main__":
    sys.exit(main())
