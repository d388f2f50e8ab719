#!/usr/bin/env python3
"""Acceptance check of the ERP label lists and the local editors, run by hand.

Builds an ERP of its own (an SQLite file behind a private ODBC data source)
with users, label definitions and label lines, prints users' lists through
the headless host with the label program journal on, works out from the ERP
file alone what the temporary documents database and the journal must hold,
and prints every difference. Then types values into the three editors of the
local tables and reads back what was stored.

    python3 acceptance/plates_check.py [--cli build/app/tagora-cli]
                                       [--seed N] [--keep DIR] [--conn-types 2,1]

Exit status 0 when everything agrees, 1 otherwise.
Python 3 standard library only.
"""

import os
import random
import shutil
import sqlite3
import subprocess
import sys

from checkrun import check_arguments, erp_text, finish, is_hebrew, run_cli, visual_to_logical, write_odbc, write_settings

SEP = "\u05f0"  # the cell separator of the cell form of a text
DEFAULT_LABEL = "/labels/default'%_.lbl"

# ------------------------------------------------------------- conversions


def label_text(value, conn_type):
    """A parameter as the label list keeps it: the cell form of a Hebrew text
    for connection types 0 and 1, any other text as it stands."""
    text = str(value)
    if conn_type not in (0, 1) or not any(is_hebrew(c) for c in text):
        return text
    mirror = {"(": ")", ")": "(", "<": ">", ">": "<", "[": "]", "]": "[", "{": "}", "}": "{"}
    return "".join(SEP + mirror.get(c, c) for c in reversed(text)) + SEP


def make_erp(path, rng, own_label, folder_label):
    db = sqlite3.connect(path)
    pars = ", ".join(f"PAR{n} VARCHAR(80)" for n in range(1, 21))
    db.executescript(f"""
CREATE TABLE USERS (USER INTEGER PRIMARY KEY, USERLOGIN VARCHAR(20));
CREATE TABLE LABELSDEF (LABELDEF INTEGER PRIMARY KEY, LABELNAME VARCHAR(32), LABELPATH VARCHAR(80));
CREATE TABLE LABELS (USER INTEGER, KLINE INTEGER, LABELQUANT INTEGER, LABELDEF INTEGER, Sort INTEGER, {pars},
  PRIMARY KEY (USER, KLINE));
CREATE TABLE PART (PART INTEGER PRIMARY KEY, PARTNAME VARCHAR(22), PARTDES VARCHAR(48));
""")
    db.executemany("INSERT INTO USERS VALUES (?,?)", [
        (0, "system"), (1, "admin"), (2, "  avi  "), (3, "empty.list"),
        (4, "הנד 12"),  # kept in display order by the ERP
        (5, ""), (6, None), (7, "warehouse"),
    ])
    db.executemany("INSERT INTO LABELSDEF VALUES (?,?,?)", [
        (1, "מדבקת מדף", own_label),
        (2, "empty path", ""),
        (3, "null path", None),
        (4, "missing file", "/no/such/folder/missing.lbl"),
        (5, "", folder_label),  # a folder, not a file
        (6, None, own_label),
    ])
    texts = [None, "", "plain", "O'Hara 50%_off", "מחיר (מבצע) 12.50", "שלום [עולם]",
             "L" * 60, "א" * 55, "  padded  ", 'quote " and \\ back', "<tag>{x}"]
    kline = 0
    for user, count in ((1, 9), (2, 4), (4, 6), (7, 7)):
        for n in range(count):
            kline += rng.randint(1, 3)
            row = [user, kline, rng.choice([0, 1, 2, 5, 17]), rng.choice([1, 2, 3, 4, 5, 6, 6, 1, 99]),
                   rng.choice([1, 2, 2, 3])]
            row += [rng.choice(texts) for _ in range(20)]
            db.execute(f"INSERT INTO LABELS VALUES ({', '.join('?' * 25)})", row)
    db.commit()
    db.close()


def erp_users(erp_path, conn_type):
    db = sqlite3.connect(erp_path)
    users = []
    for user, login in db.execute("SELECT USER, USERLOGIN FROM USERS WHERE USER > 0"):
        name = "" if login is None else str(login).strip()
        if name:
            users.append((user, visual_to_logical(name, conn_type)))
    db.close()
    return users


# --------------------------------------------------------- the expectation


def expected(erp_path, user, conn_type, rows):
    """tPLabDef and tPLabData rows, and the labels printed in their order."""
    db = sqlite3.connect(erp_path)
    db.row_factory = sqlite3.Row
    defs = {}
    for r in db.execute("SELECT * FROM LABELSDEF"):
        path = erp_text(r["LABELPATH"], "", conn_type)
        if not path or not os.path.isfile(path):
            path = DEFAULT_LABEL
        defs[r["LABELDEF"]] = {"LabelID": r["LABELDEF"], "LabelName": erp_text(r["LABELNAME"], "?", conn_type),
                               "LabelPath": path}
    data = {}
    for r in db.execute("SELECT * FROM LABELS WHERE USER = ?", (user,)):
        row = {"KLine": r["KLINE"], "Copies": r["LABELQUANT"], "LabelID": r["LABELDEF"], "LineSort": r["Sort"]}
        for n in range(1, 21):
            v = r[f"PAR{n}"]
            row[f"Par{n}"] = label_text(v, conn_type) if v is not None and len(str(v)) > 0 else None
        data[r["KLINE"]] = row
    db.close()
    # A roll printer prints the list from its end.
    printed = []
    for d in sorted(data.values(), key=lambda x: (x["LineSort"], x["KLine"]), reverse=True):
        if d["LabelID"] not in defs:
            continue
        variables = []
        for row in rows:
            if row["sent"] and whole_var(row["var"]):
                value = d[f"Par{int(row['var'].strip())}"]
                variables.append((row["name"], "" if value is None else value))
        printed.append({"file": defs[d["LabelID"]]["LabelPath"], "vars": variables, "copies": d["Copies"]})
    return defs, data, printed


def whole_var(caption):
    t = caption.strip()
    return t.isdigit() and 1 <= int(t) <= 20


# ------------------------------------------------------------ the real run








def journal_args(text):
    """The arguments of one journal call: texts with their backslash escapes
    undone, anything else as written."""
    out, i = [], 0
    while i < len(text):
        c = text[i]
        if c in " ,":
            i += 1
            continue
        if c == '"':
            i += 1
            value = ""
            while i < len(text) and text[i] != '"':
                if text[i] == "\\" and i + 1 < len(text):
                    i += 1
                value += text[i]
                i += 1
            out.append(value)
            i += 1
        else:
            j = i
            while j < len(text) and text[j] != ",":
                j += 1
            out.append(text[i:j].strip())
            i = j
    return out


def read_journal(path):
    printed, file, variables = [], None, []
    if not os.path.exists(path):
        return printed
    with open(path, encoding="utf-8") as f:
        for line in f:
            line = line.rstrip("\n")
            for member in ("LabelOpen(", "LabelSetVar(", "LabelPrint(", "LabelSessionPrint("):
                at = line.find("." + member)
                if at < 0:
                    continue
                inner = line[at + len(member) + 1:line.rfind(")")]
                args = journal_args(inner)
                if member == "LabelOpen(":
                    file = args[0]
                elif member == "LabelSetVar(":
                    variables.append((args[1], args[2]))
                else:
                    q = args[1].split(",")[0]
                    printed.append({"file": file, "vars": variables, "copies": int(q) if q.lstrip("-").isdigit() else q})
                    variables = []
    return printed


def actual(data):
    tmp = sqlite3.connect(os.path.join(data, "tgrrtdb.tmp"))
    tmp.row_factory = sqlite3.Row
    defs = {r["LabelID"]: dict(r) for r in tmp.execute("SELECT * FROM tPLabDef")}
    lines = {r["KLine"]: {k.capitalize() if k.upper().startswith("PAR") else k: r[k] for k in r.keys()}
             for r in tmp.execute("SELECT * FROM tPLabData")}
    tmp.close()
    return defs, lines


def compare(name, want, got, out):
    diffs = 0
    for k in sorted(set(want) | set(got), key=str):
        if k not in got:
            out.append(f"  {name} {k}: missing; expected {want[k]}")
            diffs += 1
        elif k not in want:
            out.append(f"  {name} {k}: not expected; written {got[k]}")
            diffs += 1
        else:
            for c in want[k]:
                if want[k][c] != got[k].get(c):
                    out.append(f"  {name} {k} {c}: expected {want[k][c]!r}, written {got[k].get(c)!r}")
                    diffs += 1
    return diffs


def field_rows(cli, env, ini):
    """Rows 0 to 32 of the label field table: name on the label, kind, column."""
    verbs = []
    for i in range(33):
        verbs += ["get", f"LblFldName({i}).Caption", "get", f"LblFldName({i}).Tag", "get", f"LblFldDesc({i}).Tag"]
    r = run_cli(cli, env, ini, verbs)
    out = r.stdout.splitlines()[-99:]
    return [{"row": i, "name": out[3 * i], "kind": out[3 * i + 1], "column": out[3 * i + 2]} for i in range(33)]


# Variable numbers given to the chosen text rows, and whether each is ticked.
ROW_PLANS = [
    [("1", True), ("3", True), (" 20 ", True), ("2.5", True), ("21", True), ("0", True), ("4", False), ("", True)],
    [("7", True), ("7", True), ("12", True), ("abc", True), ("5", True), ("-1", True), ("19", True), ("2", False)],
]


def plate_verbs(rows):
    verbs = []
    for i in range(38):
        verbs += ["set", f"ChkFldSend({i})", "0", "set", f"lblVarNum({i})", ""]
    for row in rows:
        verbs += ["set", f"ChkFldSend({row['row']})", "1" if row["sent"] else "0",
                  "set", f"lblVarNum({row['row']})", row["var"]]
    return verbs + ["set", "txtLabelName", DEFAULT_LABEL, "set", "ChkUseAccKeyForPlate", "0"]


def check_plates(cli, env, ini, data, journal, erp_path, conn_type, out):
    n = 0
    fields = field_rows(cli, env, ini)
    text_rows, seen = [], set()
    for f in fields:
        if f["kind"] == "1" and f["column"] and f["column"] not in seen:
            seen.add(f["column"])
            text_rows.append(f)
    if len(text_rows) < 8:
        out.append(f"  only {len(text_rows)} text rows in the label field table")
        return 1
    users = erp_users(erp_path, conn_type)
    r = run_cli(cli, env, ini, ["get", "cmbUser.ListCount"] +
                sum((["set", "cmbUser", str(p), "get", "cmbUser.Text", "call", "GetUserNum"] for p in range(len(users))), []))
    got = r.stdout.splitlines()[-(1 + 2 * len(users)):]
    want = [str(len(users))] + sum(([u[1], str(u[0])] for u in users), [])
    if got != want:
        out.append(f"  user list: expected {want}, shown {got}")
        n += 1
    plans = [(0, ROW_PLANS[0]), (3, ROW_PLANS[1]), (1, ROW_PLANS[1]), (2, ROW_PLANS[0]), (len(users) - 1, ROW_PLANS[0])]
    for pos, plan in plans:
        rows = [dict(text_rows[i], var=v, sent=s) for i, (v, s) in enumerate(plan)]
        user = users[pos][0]
        if os.path.exists(journal):
            os.remove(journal)
        r = run_cli(cli, env, ini, ["set", "cmbUser", str(pos)] + plate_verbs(rows) + ["click", "cmdLabByPlate"])
        want_defs, want_data, want_printed = expected(erp_path, user, conn_type, rows)
        got_defs, got_data = actual(data)
        k = compare("tPLabDef", want_defs, got_defs, out)
        k += compare(f"user {user} tPLabData", want_data, got_data, out)
        got_printed = read_journal(journal)
        if os.path.exists(journal):
            shutil.copy(journal, f"{journal}.user{user}")
        if not want_printed:
            if r.returncode != 1 or "לא נבחרו פריטים להדפסה" not in r.stderr:
                out.append(f"  user {user}: an empty list must end with a fault; ended {r.returncode}: {r.stderr.strip()}")
                k += 1
        elif r.returncode != 0:
            out.append(f"  user {user}: tagora-cli ended with {r.returncode}: {r.stderr.strip()}")
            k += 1
        for i in range(max(len(want_printed), len(got_printed))):
            w = want_printed[i] if i < len(want_printed) else None
            g = got_printed[i] if i < len(got_printed) else None
            if w != g:
                out.append(f"  user {user} label {i + 1}: expected {w}, journal {g}")
                k += 1
        print(f"   user {user} ({users[pos][1]}): {len(want_data)} lines, {len(want_printed)} labels expected;"
              f" {len(got_data)} lines, {len(got_printed)} labels; {k} differences")
        n += k
    # A read that fails ends the run before anything is printed.
    db = sqlite3.connect(erp_path)
    db.execute("ALTER TABLE LABELSDEF RENAME TO LABELSDEF_GONE")
    db.commit()
    db.close()
    if os.path.exists(journal):
        os.remove(journal)
    rows = [dict(text_rows[i], var=v, sent=s) for i, (v, s) in enumerate(ROW_PLANS[0])]
    r = run_cli(cli, env, ini, ["set", "cmbUser", "0"] + plate_verbs(rows) + ["click", "cmdLabByPlate"])
    printed = read_journal(journal)
    if r.returncode != 1 or "שגיאה בקריאת סוגי מדבקות" not in r.stderr or printed:
        out.append(f"  failed definition read: expected a critical message and no labels; ended {r.returncode},"
                   f" {len(printed)} labels, messages: {r.stderr.strip()}")
        n += 1
    db = sqlite3.connect(erp_path)
    db.execute("ALTER TABLE LABELSDEF_GONE RENAME TO LABELSDEF")
    db.commit()
    db.close()
    return n


# ------------------------------------------------------------- the editors

TRICKY = ["O'Hara", "50%_off", "a'b%c_d", "%", "_", "''"]


def check_editors(cli, env, ini, data, out):
    n = 0
    items = os.path.join(data, "tgrmitm.tdb")
    # Account definitions: one new definition per value, its key typed in.
    verbs = ["click", "cmdAccDef"]
    for i, v in enumerate(TRICKY, 1):
        verbs += ["click", "cmdAddAccount", "setcell", "VSAccountDef", str(i), "1", v]
    verbs += ["click", "cmdClose"]
    r = run_cli(cli, env, ini, verbs, answer="yes")
    db = sqlite3.connect(items)
    got = [k for (k,) in db.execute("SELECT AccountKey FROM tAccountDef ORDER BY DefID")]
    db.close()
    if got[-len(TRICKY):] != TRICKY:
        out.append(f"  tAccountDef keys: expected {TRICKY}, stored {got}; {r.returncode} {r.stderr.strip()}")
        n += 1
    # Items: one new item, its name typed in.
    db = sqlite3.connect(items)
    cols = [c[1] for c in db.execute("PRAGMA table_info(tItems)")]
    db.close()
    r = run_cli(cli, env, ini, ["click", "cmdEditItems", "click", "cmdAddAccount",
                                "getcell", "VSEditItems", "1", "0", "getcell", "VSEditItems", "1", "1",
                                "getcell", "VSEditItems", "1", "2", "click", "cmdClose"], answer="yes")
    shown = r.stdout.splitlines()[-3:]
    name_col = next((c for c, v in enumerate(shown) if v == "פריט חדש"), None)
    if name_col is None:
        out.append(f"  tItems: the new item was not shown ({shown}); {r.stderr.strip()}")
        return n + 1
    value = "Shelf 'A' 10%_x"
    r = run_cli(cli, env, ini, ["click", "cmdEditItems", "set", "txtItmSearchValue", "00000000", "click", "cmdShowItems",
                                "setcell", "VSEditItems", "1", str(name_col), value, "click", "cmdClose"], answer="yes")
    db = sqlite3.connect(items)
    got = [k for (k,) in db.execute("SELECT ItemName FROM tItems WHERE ItemKey = '00000000'")]
    db.close()
    if got != [value]:
        out.append(f"  tItems name: expected {[value]}, stored {got}; {r.returncode} {r.stderr.strip()}")
        n += 1
    # Alternative keys: rows whose keys differ only where an exact filter
    # must not let a wildcard through; the one row the two filters name gets
    # a bar code with an apostrophe.
    db = sqlite3.connect(items)
    db.execute("DELETE FROM tAlterKeys")
    db.executemany("INSERT INTO tAlterKeys (AccountKey, ItemKey, AlterNum, AlterBar) VALUES (?,?,?,?)",
                   [("O'B%", "A_1", "N1", None), ("O'Bx", "A_1", "N2", None), ("O'B%", "AB1", "N3", None),
                    ("O'B", "A_1", "N4", None)])
    db.commit()
    db.close()
    bar = "7'7%_7"
    r = run_cli(cli, env, ini, ["click", "cmdAlterKeys", "set", "cmbAltSearchBy(0)", "0",
                                "set", "txtAltSearchValue(0)", "O'B%", "set", "cmbAltSearchBy(1)", "1",
                                "set", "txtAltSearchValue(1)", "A_1", "click", "CmdShowAlterKeys",
                                "getcell", "VSAlterKeys", "1", "3",
                                "setcell", "VSAlterKeys", "1", "3", "N1'%_",  # also puts the row in the selection
                                "set", "txtAltBarCode", bar, "click", "cmdSetAltBar", "click", "cmdClose"], answer="yes")
    shown = r.stdout.splitlines()[-1:]
    if r.returncode != 0 or shown != ["N1"]:
        out.append(f"  tAlterKeys filter O'B% / A_1: expected only N1 shown, shown {shown}; {r.returncode} {r.stderr.strip()}")
        n += 1
    db = sqlite3.connect(items)
    got = sorted((a or "-") + "=" + (b or "-") for a, b in db.execute("SELECT AlterNum, AlterBar FROM tAlterKeys"))
    db.close()
    if got != ["N1'%_=" + bar, "N2=-", "N3=-", "N4=-"]:
        out.append(f"  tAlterKeys: expected only N1 to become N1'%_ with {bar!r}, stored {got}")
        n += 1
    return n


def main():
    args, work = check_arguments(__doc__, "plates-check-", seed=4_117_003, conn_types=True)
    summary = []
    for conn_type in [int(x) for x in args.conn_types.split(",")]:
        rng = random.Random(args.seed + conn_type)
        base = os.path.join(work, f"type{conn_type}")
        shutil.rmtree(base, ignore_errors=True)
        os.makedirs(os.path.join(base, "labels.d"))
        own_label = os.path.join(base, "own'label.lbl")
        with open(own_label, "w") as f:
            f.write("x")
        data = os.path.join(base, "data")
        os.makedirs(data)
        erp_path = os.path.join(base, "erp.sqlite")
        make_erp(erp_path, rng, own_label, os.path.join(base, "labels.d"))
        write_odbc(base, erp_path)
        ini = os.path.join(base, "check.ini")
        journal = os.path.join(base, "journal.txt")
        write_settings(ini, data, conn_type, f"[Automation]\nJournalFile={journal}\n")
        env = dict(os.environ, QT_QPA_PLATFORM="offscreen", ODBCSYSINI=base, ODBCINI=os.path.join(base, "user-odbc.ini"))
        for name, check in (("label lists", lambda o: check_plates(args.cli, env, ini, data, journal, erp_path, conn_type, o)),
                            ("editors", lambda o: check_editors(args.cli, env, ini, data, o))):
            out = []
            print(f"== type {conn_type}: {name}")
            try:
                n = check(out)
            except Exception as e:  # a run that left nothing to read is a difference too
                out.append(f"  the check stopped: {type(e).__name__}: {e}")
                n = len(out)
            for line in out:
                print(line)
            summary.append((f"type {conn_type}: {name}", n))

    return finish(summary, work, args.keep)


if __name__ == "__main__":
    sys.exit(main())
