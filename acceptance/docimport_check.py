#!/usr/bin/env python3
"""Acceptance check of the document import, run by hand.

Builds an ERP of its own (an SQLite file behind a private ODBC data source),
runs the real import through the headless host for several settings, works
out from the ERP file alone what the temporary documents database and the
import ranges must hold, and prints every difference.

    python3 acceptance/docimport_check.py [--cli build/app/tagora-cli]
                                          [--seed N] [--keep DIR]

Exit status 0 when every run agrees, 1 otherwise.
Python 3 standard library only.
"""

import datetime as dt
import os
import random
import shutil
import sqlite3
import subprocess
import sys

from checkrun import check_arguments, finish, run_cli, write_odbc, write_settings

EPOCH = dt.datetime(1988, 1, 1)
BOUNDARY = dt.date(2026, 3, 15)  # the day the date ranges of the runs cut across

# ------------------------------------------------------------------ the ERP


def erp_date(value, conn_type):
    """A date/time as the ERP keeps it: minutes since 1988 (connection type 2)
    or a date text, with the time of day when there is one (type 1)."""
    if conn_type == 2:
        delta = value - EPOCH
        return delta.days * 1440 + delta.seconds // 60
    if value.hour == 0 and value.minute == 0:
        return value.strftime("%Y-%m-%d")
    return value.strftime("%Y-%m-%d %H:%M:%S")


def pick(rng, *choices):
    return rng.choice(choices)


def make_erp(path, rng, conn_type):
    date_type = "INTEGER" if conn_type == 2 else "DATE"
    db = sqlite3.connect(path)
    db.executescript(f"""
CREATE TABLE PART (PART INTEGER PRIMARY KEY, PARTNAME VARCHAR(22), PARTDES VARCHAR(48));
CREATE TABLE CUSTOMERS (CUST INTEGER PRIMARY KEY, CUSTNAME VARCHAR(16), CUSTDES VARCHAR(48),
  ADDRESS VARCHAR(48), PHONE VARCHAR(20), MCUST INTEGER);
CREATE TABLE SUPPLIERS (SUP INTEGER PRIMARY KEY, SUPNAME VARCHAR(16), SUPDES VARCHAR(48),
  ADDRESS VARCHAR(48), PHONE VARCHAR(20));
CREATE TABLE ORDERS (ORD INTEGER PRIMARY KEY, ORDNAME VARCHAR(16), CUST INTEGER, CURDATE {date_type},
  REFERENCE VARCHAR(16), DETAILS VARCHAR(24), FINAL CHAR(1));
CREATE TABLE ORDERITEMS (ORDI INTEGER PRIMARY KEY, ORD INTEGER, LINE INTEGER, PART INTEGER,
  QUANT REAL, TQUANT REAL, NUMPACK INTEGER);
CREATE TABLE ORDERITEMSA (ORDI INTEGER PRIMARY KEY, NUMPACK INTEGER);
CREATE TABLE PORDERS (ORD INTEGER PRIMARY KEY, ORDNAME VARCHAR(16), SUP INTEGER, CURDATE {date_type},
  REFERENCE VARCHAR(16), DETAILS VARCHAR(24));
CREATE TABLE PORDERITEMS (ORDI INTEGER PRIMARY KEY, ORD INTEGER, LINE INTEGER, PART INTEGER,
  QUANT REAL, TQUANT REAL, NUMPACK INTEGER);
CREATE TABLE PORDERITEMSA (ORDI INTEGER PRIMARY KEY, NUMPACK INTEGER);
CREATE TABLE DOCUMENTS (DOC INTEGER PRIMARY KEY, DOCNO VARCHAR(16), TYPE CHAR(1), CUST INTEGER,
  SUP INTEGER, CURDATE {date_type}, BOOKNUM VARCHAR(16), DETAILS VARCHAR(24), FINAL CHAR(1));
CREATE TABLE TRANSORDER (TRANS INTEGER PRIMARY KEY, DOC INTEGER, LINE INTEGER, PART INTEGER,
  QUANT REAL, TQUANT REAL, NUMPACK INTEGER);
CREATE TABLE INVOICES (IV INTEGER PRIMARY KEY, IVNUM VARCHAR(16), TYPE CHAR(1), CUST INTEGER,
  IVDATE {date_type}, REFERENCE VARCHAR(16), DETAILS VARCHAR(24), FINAL CHAR(1));
CREATE TABLE INVOICEITEMS (KLINE INTEGER PRIMARY KEY, IV INTEGER, LINE INTEGER, PART INTEGER,
  QUANT REAL, TQUANT REAL, NUMPACK INTEGER);
""")
    # Items: keys with blanks, double quotes, empty and null keys, long names.
    parts = []
    for p in range(1, 31):
        name = pick(rng, f"K{p:03d}", f"K{p:03d}", f"  K{p:03d} ", f'AB"{p}', "", "   ", None, f"k-{p}")
        des = pick(rng, f"Item {p}", f"Item {p}", "", None, "Long " * 30 + str(p), f"  Padded {p}  ")
        parts.append((p, name, des))
    db.executemany("INSERT INTO PART VALUES (?,?,?)", parts)
    part_ids = [p[0] for p in parts] + [None, 999]  # null and missing items on lines

    custs = []
    for c in range(1, 15):
        key = pick(rng, f"C{c:02d}", f"C{c:02d}", f" C{c:02d}  ", f'C"{c}', "", None,
                   f"CUSTOMER-WITH-A-LONG-KEY-{c}")
        des = pick(rng, f"Customer {c}", "", None, " Spaced name ", "X" * 120)
        addr = pick(rng, f"{c} Main St", "", None, "   ", "Y" * 300)
        phone = pick(rng, f"03-{c:07d}", "", None, "  050-1  ", "9" * 60)
        mcust = pick(rng, None, None, 0, rng.randint(1, 14), rng.randint(1, 14), c)
        custs.append((c, key, des, addr, phone, mcust))
    db.executemany("INSERT INTO CUSTOMERS VALUES (?,?,?,?,?,?)", custs)
    sups = []
    for s in range(1, 9):
        key = pick(rng, f"S{s:02d}", f" S{s:02d} ", f'S"{s}', "", None)
        sups.append((s, key, pick(rng, f"Supplier {s}", "", None), pick(rng, "Road 1", None),
                     pick(rng, "04-1", "", None)))
    db.executemany("INSERT INTO SUPPLIERS VALUES (?,?,?,?,?)", sups)

    def when():
        day = BOUNDARY + dt.timedelta(days=rng.randint(-2, 2))
        t = dt.datetime(day.year, day.month, day.day)
        if rng.random() < 0.4:
            t += dt.timedelta(hours=rng.randint(0, 23), minutes=rng.randint(0, 59))
        return erp_date(t, conn_type)

    def details():
        return pick(rng, None, "", "12", "0", "-3", "abc", "40000", "7", "12A", "5")

    def reference():
        return pick(rng, None, "", f"R{rng.randint(1, 999)}", "  ", "REF-" + "Z" * 30)

    def quant():
        return pick(rng, 0, -5, 1000, 2.5, 3.5, 1.25, 7, 12, 1500.75, 1, 4)

    def tquant():
        return pick(rng, None, 0, 2.3, 4.6, 1200.2, 0.4, -2)

    line_seq = iter(range(1, 100000))
    trans_seq = iter(range(1, 100000))

    def lines(doc):
        count = rng.randint(0, 5)
        first = pick(rng, 1, 1, 1, 1, 2)  # now and then a document without a line 1
        return [(next(line_seq), doc, first + i, rng.choice(part_ids), quant(), tquant(),
                 pick(rng, None, 0, 2, 3)) for i in range(count)]

    def pack_count():
        return pick(rng, 0, 3, 5, 600, 1)

    # Customer orders (recipe 2), ids with gaps.
    doc_id = 0
    for n in range(40):
        doc_id += rng.randint(1, 3)
        cust = pick(rng, *range(1, 15), None, 77)
        db.execute("INSERT INTO ORDERS VALUES (?,?,?,?,?,?,?)",
                   (doc_id, f"N{rng.randint(1, 400):04d}", cust, when(), reference(), details(),
                    pick(rng, "Y", "Y", "N", None)))
        for ln in lines(doc_id):
            db.execute("INSERT INTO ORDERITEMS VALUES (?,?,?,?,?,?,?)", ln)
            if rng.random() < 0.7:
                db.execute("INSERT INTO ORDERITEMSA VALUES (?,?)", (ln[0], pack_count()))
    # Purchase orders (recipe 3).
    doc_id = 0
    for n in range(25):
        doc_id += rng.randint(1, 4)
        db.execute("INSERT INTO PORDERS VALUES (?,?,?,?,?,?)",
                   (doc_id, f"P{rng.randint(1, 400):04d}", pick(rng, *range(1, 9), None), when(),
                    reference(), details()))
        for ln in lines(doc_id):
            db.execute("INSERT INTO PORDERITEMS VALUES (?,?,?,?,?,?,?)", ln)
            if rng.random() < 0.7:
                db.execute("INSERT INTO PORDERITEMSA VALUES (?,?)", (ln[0], pack_count()))
    # Stock documents (recipes 1 and 5); their ids never meet the invoices'.
    doc_id = 0
    for n in range(50):
        doc_id += rng.randint(1, 3)
        db.execute("INSERT INTO DOCUMENTS VALUES (?,?,?,?,?,?,?,?,?)",
                   (doc_id, f"D{rng.randint(1, 400):04d}", pick(rng, "D", "D", "P", "T", "S", "X"),
                    pick(rng, *range(1, 15), None), pick(rng, *range(1, 9), None), when(), reference(),
                    details(), pick(rng, "Y", "Y", "N")))
        for ln in lines(doc_id):
            db.execute("INSERT INTO TRANSORDER VALUES (?,?,?,?,?,?,?)", (next(trans_seq) + 100000,) + ln[1:])
    # Invoices (recipe 4); their package counts live in TRANSORDER by (DOC, LINE).
    doc_id = 5000
    for n in range(30):
        doc_id += rng.randint(1, 3)
        db.execute("INSERT INTO INVOICES VALUES (?,?,?,?,?,?,?,?)",
                   (doc_id, f"I{rng.randint(1, 400):04d}", pick(rng, "A", "A", "B"), pick(rng, *range(1, 15)),
                    when(), reference(), details(), pick(rng, "Y", "N")))
        for ln in lines(doc_id):
            db.execute("INSERT INTO INVOICEITEMS VALUES (?,?,?,?,?,?,?)", ln)
            if rng.random() < 0.7:
                db.execute("INSERT INTO TRANSORDER VALUES (?,?,?,?,?,?,?)",
                           (next(trans_seq) + 200000, doc_id, ln[2], None, 0, None, pack_count()))
    db.commit()
    db.close()


# --------------------------------------------------------- the expectation


def trim(v):
    return "" if v is None else str(v).strip()


def key_text(v):
    return trim(v).replace('"', "'")


def copies_of(q):
    n = round(q)  # halves to the even neighbour
    if n > 999 or n < -999:
        return 999
    return abs(n)


def is_whole_number_text(t):
    t = t.strip()
    if t.startswith(("+", "-")):
        t = t[1:]
    return t.isdigit()


def day_of(value, conn_type):
    if value is None:
        return None
    if conn_type == 2:
        return EPOCH + dt.timedelta(minutes=int(value))
    return dt.datetime.fromisoformat(str(value)) if " " in str(value) else dt.datetime.fromisoformat(str(value) + " 00:00:00")


def doc_types(config):
    config.row_factory = sqlite3.Row
    rows = config.execute(
        "SELECT t.DocType, t.WizFileID, t.vTYPE, t.Include, t.IncludeDraft, t.CSTableID, w.HeadTable, w.LineTable,"
        " w.fldID, w.fldRef1, w.fldRef2, w.fldDate, w.fldLineID, w.fldDocCSID, w.NoDraft, c.CSTableName, c.fldCSID,"
        " c.fldCSKey, c.fldCSDesc, c.fldMerakezID FROM tDocTypes t JOIN tCSTable c ON t.CSTableID = c.CSTableID"
        " JOIN tWizFiles w ON t.WizFileID = w.WizFileID ORDER BY t.DocType").fetchall()
    return [dict(r) for r in rows]


def expected(erp_path, config_rows, ranges, account_defs, settings, conn_type):
    erp = sqlite3.connect(erp_path)
    erp.row_factory = sqlite3.Row
    rule = settings["rule"]
    factor = settings["factor"]
    only1 = settings["only_line1"]
    pref, from_box, to_box = settings.get("pref", ""), settings.get("from", ""), settings.get("to", "")
    lower = pref + from_box if from_box else ""
    upper = pref + to_box if to_box else ""
    include_header = from_box == to_box
    d_from, d_to = settings.get("from_date"), settings.get("to_date")
    headers, lines, new_ranges = {}, {}, dict(ranges)
    part = {r["PART"]: r for r in erp.execute("SELECT * FROM PART")}
    for t in config_rows:
        if not t["Include"]:
            continue
        H, L = t["HeadTable"], t["LineTable"]
        join = t["CSTableID"] in (1, 2)
        accounts = {}
        if join:
            accounts = {r[t["fldCSID"]]: r for r in erp.execute(f"SELECT * FROM {t['CSTableName']}")}
        start = ranges[t["DocType"]][0]
        read = []
        for h in erp.execute(f"SELECT * FROM {H} ORDER BY {t['fldID']}"):
            hid = h[t["fldID"]]
            if hid is None or hid <= 0:
                continue
            if join and h[t["fldDocCSID"]] not in accounts:
                continue
            if t["vTYPE"] is not None and h["TYPE"] != t["vTYPE"]:
                continue
            if not lower and hid < start:
                continue
            when = day_of(h[t["fldDate"]], conn_type)
            if d_from and (when is None or when.date() < d_from):
                continue
            if d_to and (when is None or when.date() > d_to):
                continue
            if not t["IncludeDraft"] and t["NoDraft"] and h["FINAL"] != "Y":
                continue  # every NoDraft fragment this check writes is FINAL = 'Y'
            num = h[t["fldRef1"]]
            if lower and lower == upper:
                if num is None or not num.lower().endswith(lower.lower()):
                    continue
            else:
                if lower and (num is None or num < lower):
                    continue
                if upper and (num is None or num > upper):
                    continue
            read.append(h)
        if not read:
            continue
        for h in read:
            hid = h[t["fldID"]]
            own = key_text(accounts[h[t["fldDocCSID"]]][t["fldCSKey"]]) if join else ""
            key = ""
            acc = accounts.get(h[t["fldDocCSID"]]) if join else None
            if join and t["fldMerakezID"]:
                m = accounts.get(acc[t["fldMerakezID"]])
                if m is not None:
                    key = key_text(m[t["fldCSKey"]])
            if not key:
                key = own
            if own and own in account_defs and key != own:
                key = own
            ref = h[t["fldRef2"]]
            headers[(t["WizFileID"], hid)] = {
                "WizFileID": t["WizFileID"], "Number": hid, "DocType": t["DocType"],
                "Reference1": h[t["fldRef1"]], "DocDate": day_of(h[t["fldDate"]], conn_type),
                "AccountKey": key or "?",
                "CardName": trim(acc[t["fldCSDesc"]]) if join else "",
                "Address": trim(acc["ADDRESS"]) if join else "",
                "Phone1": trim(acc["PHONE"]) if join else "",
                "Copies": 1, "TotalCrates": 1, "Include": include_header,
                "NumAtCard": str(ref) if ref is not None and len(str(ref)) > 0 else "",
                "OrigAccountKey": own,
            }
            head_q = 0
            if rule == 1:
                d = h["DETAILS"]
                if d is not None and d != "" and is_whole_number_text(d):
                    head_q = int(d.strip())
            for ln in erp.execute(f"SELECT * FROM {L} WHERE {t['fldID']} = ? ORDER BY LINE", (hid,)):
                p = part.get(ln["PART"])
                if p is None:
                    continue
                item = key_text(p["PARTNAME"])
                if not item:
                    continue
                q = float(ln["QUANT"] or 0)
                if rule == 1 and head_q > 0:
                    q = float(head_q)
                elif rule == 2:
                    tq = round(float(ln["TQUANT"] or 0))
                    if tq > 0:
                        q = float(tq)
                elif rule == 4:
                    q = 1.0
                q *= factor
                quantity = q
                include = True
                if only1:
                    include = ln["LINE"] == 1
                    if ln["LINE"] == 1 and rule in (0, -1):
                        q = 1
                name = p["PARTDES"] or ""
                lines[(t["WizFileID"], hid, ln["LINE"])] = {
                    "WizFileID": t["WizFileID"], "Number": ln[t["fldLineID"]], "HeadNumber": hid,
                    "LineNum": ln["LINE"], "ItemKey": item, "ItemKeySon": item, "ItemName": name,
                    "ItemNameSon": name, "Quantity": quantity, "Include": include, "Copies": copies_of(q),
                }
            if rule == 3:
                ext = {2: ("ORDERITEMSA", "EX.ORDI = L.ORDI"), 3: ("PORDERITEMSA", "EX.ORDI = L.ORDI"),
                       4: ("TRANSORDER", "EX.DOC = L.IV AND EX.LINE = L.LINE")}.get(t["WizFileID"])
                if ext:
                    sql = (f"SELECT L.LINE, EX.NUMPACK AS Packs FROM {L} L, {ext[0]} EX"
                           f" WHERE L.{t['fldID']} = ? AND {ext[1]}")
                else:
                    sql = f"SELECT L.LINE, L.NUMPACK AS Packs FROM {L} L WHERE L.{t['fldID']} = ?"
                for r in erp.execute(sql, (hid,)):
                    packs = round((r["Packs"] or 0) * factor)
                    row = lines.get((t["WizFileID"], hid, r["LINE"]))
                    if row is not None and packs > 0:
                        row["Quantity"] = float(packs)
                        row["Copies"] = copies_of(packs)
        if not to_box:
            last = max(h[t["fldID"]] for h in read)
            old_from = ranges[t["DocType"]][0]
            new_ranges[t["DocType"]] = (max(old_from, last + 1), last)
    erp.close()
    return headers, lines, new_ranges


# ------------------------------------------------------------ the real run








def date_text(d):
    return d.strftime("%d/%m/%Y") if d else ""


def actual(data):
    tmp = sqlite3.connect(os.path.join(data, "tgrrtdb.tmp"))
    tmp.row_factory = sqlite3.Row
    heads = {(r["WizFileID"], r["Number"]): dict(r) for r in tmp.execute("SELECT * FROM tTempDocHeaders")}
    lns = {(r["WizFileID"], r["HeadNumber"], r["LineNum"]): dict(r) for r in tmp.execute("SELECT * FROM tTempDocLines")}
    tmp.close()
    return heads, lns


def read_ranges(data):
    c = sqlite3.connect(os.path.join(data, "tagora.tdb"))
    r = {w: (f, l) for w, f, l in c.execute("SELECT WizFileID, FromIndx, LastIndx FROM tWizFileRanges")}
    c.close()
    return r


def same(column, want, got, conn_type):
    if column == "DocDate":
        if got is None or want is None:
            return got is None and want is None
        g = dt.datetime.fromisoformat(str(got).replace("T", " "))
        # A type-1 date arrives through the driver as its day.
        return g == want if conn_type == 2 else g.date() == want.date()
    if column == "Include":
        return bool(got) == bool(want) and got is not None
    if column == "Quantity":
        return got is not None and abs(float(got) - float(want)) < 1e-6
    if isinstance(want, str):  # texts written "only when not empty"
        return (got or "") == want
    return got == want


def compare(name, want, got, columns, conn_type, out):
    diffs = 0
    for k in sorted(set(want) | set(got), key=lambda x: tuple(-1 if v is None else v for v in x)):
        if k not in got:
            out.append(f"  {name} {k}: missing; expected {want[k]}")
            diffs += 1
        elif k not in want:
            out.append(f"  {name} {k}: not expected; written {dict((c, got[k].get(c)) for c in columns)}")
            diffs += 1
        else:
            for c in columns:
                if not same(c, want[k][c], got[k].get(c), conn_type):
                    out.append(f"  {name} {k} {c}: expected {want[k][c]!r}, written {got[k].get(c)!r}")
                    diffs += 1
    return diffs


HEAD_COLUMNS = ["WizFileID", "Number", "DocType", "Reference1", "DocDate", "AccountKey", "CardName", "Address",
                "Phone1", "Copies", "TotalCrates", "Include", "NumAtCard", "OrigAccountKey"]
LINE_COLUMNS = ["WizFileID", "Number", "HeadNumber", "LineNum", "ItemKey", "ItemKeySon", "ItemName",
                "ItemNameSon", "Quantity", "Include", "Copies"]

RUNS = [
    # name, ranges before the run (None: as the last run left them), settings
    ("rule 0, all documents", 0, dict(rule=0, factor="1", only_line1=False)),
    ("rule 0 again: nothing new", None, dict(rule=0, factor="1", only_line1=False)),
    ("rule 1, factor 2, first line only, from the middle", "mid", dict(rule=1, factor="2", only_line1=True)),
    ("rule 2, factor 1.5, dates across the boundary day", 0,
     dict(rule=2, factor="1.5", only_line1=False, from_date=BOUNDARY - dt.timedelta(days=1), to_date=BOUNDARY)),
    ("rule 3, factor 2, first line only", 0, dict(rule=3, factor="2", only_line1=True)),
    ("rule 4, factor 3, numbers with a prefix", "mid", dict(rule=4, factor="3", only_line1=False,
                                                          pref="N0", **{"from": "100", "to": "250"})),
    ("rule 0, factor 0.5, lower number only with a prefix, from far ahead", "high",
     dict(rule=0, factor="0.5", only_line1=True, pref="N0", **{"from": "200"})),
    ("rule 1, text factor, same number in both boxes", 0,
     dict(rule=1, factor="x", only_line1=False, pref="", **{"from": "5", "to": "5"})),
    ("rule 3, factor 1, upper date only, prefix with empty boxes", 0,
     dict(rule=3, factor="1", only_line1=False, pref="N0", to_date=BOUNDARY)),
]


def factor_value(text):
    try:
        return float(text)
    except ValueError:
        return 1.0


def main():
    args, work = check_arguments(__doc__, "docimport-check-", seed=7_304_219, conn_types=True)

    summary = []
    for conn_type in [int(x) for x in args.conn_types.split(",")]:
        rng = random.Random(args.seed + conn_type)
        base = os.path.join(work, f"type{conn_type}")
        shutil.rmtree(base, ignore_errors=True)
        os.makedirs(base)
        data = os.path.join(base, "data")
        os.makedirs(data)
        erp_path = os.path.join(base, "erp.sqlite")
        make_erp(erp_path, rng, conn_type)
        write_odbc(base, erp_path)
        ini = os.path.join(base, "check.ini")
        write_settings(ini, data, conn_type)
        env = dict(os.environ, QT_QPA_PLATFORM="offscreen", ODBCSYSINI=base, ODBCINI=os.path.join(base, "user-odbc.ini"))
        # A first import gets a new data folder ready; its rows are not looked at.
        r = run_cli(args.cli, env, ini, ["click", "cmdImportDocs", "click", "cmdClose"])
        if not os.path.exists(os.path.join(data, "tagora.tdb")):
            print(f"the data folder was not prepared:\n{r.stdout}{r.stderr}")
            return 1
        # Recipes that differ from the supplied ones: another TYPE code for the
        # delivery notes, drafts left out of customer orders, the drafts of
        # goods receipts taken in, and every type imported.
        cfg = sqlite3.connect(os.path.join(data, "tagora.tdb"))
        cfg.execute("UPDATE tDocTypes SET Include = 1")
        cfg.execute("UPDATE tDocTypes SET vTYPE = 'S' WHERE DocType = 3")
        cfg.execute("UPDATE tDocTypes SET IncludeDraft = 1 WHERE DocType = 4")
        cfg.execute("UPDATE tWizFiles SET NoDraft = 'FINAL = ''Y''' WHERE WizFileID = 2")
        cfg.commit()
        config_rows = doc_types(cfg)
        cfg.close()
        # Label definitions for some accounts, by their trimmed keys.
        erp = sqlite3.connect(erp_path)
        keys = sorted({key_text(k) for (k,) in erp.execute("SELECT CUSTNAME FROM CUSTOMERS UNION ALL"
                                                             " SELECT SUPNAME FROM SUPPLIERS")} - {""})
        erp.close()
        defs = set(rng.sample(keys, len(keys) // 2))
        items = sqlite3.connect(os.path.join(data, "tgrmitm.tdb"))
        items.execute("DELETE FROM tAccountDef")
        items.executemany("INSERT INTO tAccountDef (DefID, AccountKey, Include) VALUES (?, ?, 1)",
                          list(enumerate(sorted(defs), 1)))
        items.commit()
        items.close()

        for name, start, s in RUNS:
            cfg = sqlite3.connect(os.path.join(data, "tagora.tdb"))
            if start == 0:
                cfg.execute("UPDATE tWizFileRanges SET FromIndx = 0, LastIndx = 0")
            elif start == "mid":
                cfg.execute("UPDATE tWizFileRanges SET FromIndx = 20, LastIndx = 19")
            elif start == "high":  # beyond every document: a run by numbers must not move it back
                cfg.execute("UPDATE tWizFileRanges SET FromIndx = 9000, LastIndx = 8999")
            cfg.commit()
            cfg.close()
            ranges = read_ranges(data)
            settings = dict(s, factor=factor_value(s["factor"]))
            want_h, want_l, want_r = expected(erp_path, config_rows, ranges, defs, settings, conn_type)
            verbs = ["set", "txtFromDate", date_text(s.get("from_date")), "set", "txtToDate", date_text(s.get("to_date")),
                     "set", "txtRefPref", s.get("pref", ""), "set", "txtFromDocNum", s.get("from", ""),
                     "set", "txtToDocNum", s.get("to", ""), "set", "cmbQtyFrom", str(s["rule"]),
                     "set", "txtQtyFactor", s["factor"], "set", "chkOnlyLine0", "1" if s["only_line1"] else "0",
                     "set", "chkReadDocItems", "0", "click", "cmdImportDocs", "click", "cmdClose"]
            r = run_cli(args.cli, env, ini, verbs)
            out = []
            if r.returncode != 0:
                out.append(f"  tagora-cli ended with {r.returncode}: {r.stderr.strip()}")
            got_h, got_l = actual(data)
            got_r = read_ranges(data)
            n = len(out)
            n += compare("header", want_h, got_h, HEAD_COLUMNS, conn_type, out)
            n += compare("line", want_l, got_l, LINE_COLUMNS, conn_type, out)
            for w in sorted(want_r):
                if want_r[w] != got_r.get(w):
                    out.append(f"  range {w}: expected FromIndx/LastIndx {want_r[w]}, written {got_r.get(w)}"
                               f" (before the run {ranges[w]})")
                    n += 1
            label = f"type {conn_type}: {name}"
            print(f"== {label}: {len(want_h)} headers, {len(want_l)} lines expected; "
                  f"{len(got_h)} headers, {len(got_l)} lines written; {n} differences")
            for line in out:
                print(line)
            summary.append((label, n))

    return finish(summary, work, args.keep)


if __name__ == "__main__":
    sys.exit(main())
