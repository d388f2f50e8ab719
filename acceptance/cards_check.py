#!/usr/bin/env python3
"""Acceptance check of the item cards, run by hand.

Builds an ERP of its own (an SQLite file behind a private ODBC data source)
holding the card's tables, and a data folder whose local tables hold the same
items; opens the ERP card and the local card of each item from the item
selection's card column through the headless host (and the local card with an
account through `call-info`), and compares each page's texts, in reading
order, with what it works out from the ERP file and the local rows alone:
captions, values, number formats, sections left out, escaping, the picture.

    python3 acceptance/cards_check.py [--cli build/app/tagora-cli]
                                      [--keep DIR] [--conn-types 2,1]

Exit status 0 when everything agrees, 1 otherwise.
Python 3 standard library only; the SQLite ODBC driver must be installed.
"""

import datetime as dt
import difflib
import html.parser
import os
import sqlite3
import sys
import urllib.parse

from checkrun import (check_arguments, erp_text, finish, private_host, replace_section, run_cli,
                      visual_to_logical, write_odbc)

EPOCH = dt.date(1988, 1, 1)
TODAY = dt.date.today()
COMPANY = "ונמר מערכות מידע"

# ------------------------------------------------------------------ the ERP

# Items: id, key, name, family, unit, barcode, type. Texts are in reading order here.
ITEMS = [
    (1, "O'NEIL-1", 'בורג <ראש> & שטוח', 1, 1, "7290000000015", "P"),
    (2, "PLAIN-2", "Plain item", 2, 1, None, "R"),
    (3, "SON-A", "בן א", 1, 1, None, "R"),
    (4, "SON-B", "Son B", 1, 1, None, "P"),
    (5, "SON-C", 'בן "ג"', 2, 1, None, "R"),
    (6, "OTHER-6", "Not a part", 1, 1, None, "O"),
    (7, "עברי-7", "פריט בעברית", 1, 1, None, "P"),
]
FAMILIES = [(1, "BOLT", "ברגים"), (2, "MISC", "Misc & more")]
UNITS = [(1, "יח'")]
SUPPLIERS = [(1, "S1", "ספק ראשי"), (2, "S2", "Second <sup>")]
CUSTOMERS = [(1, "C-B", "לקוח ב'"), (2, "C'A", "Customer <A>"), (3, "C-C", "Old")]
CURRENCIES = [(1, 'ש"ח'), (2, "$")]
PRICELISTS = [(1, "מחירון בסיס"), (2, "Dealers & Co")]
SPEC_TYPES = [(0, "zero"), (1, "צבע"), (2, ""), (3, "חומר"), (4, "אורך"), (5, "משקל")]


def day(offset):
    return TODAY + dt.timedelta(days=offset)


def erp_day(d, conn_type):
    return (d - EPOCH).days * 1440 if conn_type == 2 else d.strftime("%Y-%m-%d")


def stored(text, conn_type):
    """A text as the ERP keeps it: display order for types 0 and 1."""
    if text is None or conn_type == 2 or not any("\u05d0" <= c <= "\u05ea" for c in text):
        return text
    visual = visual_to_logical(text, conn_type)
    assert visual_to_logical(visual, conn_type) == text, text
    return visual


def make_erp(path, conn_type, company):
    date = "INTEGER" if conn_type == 2 else "DATE"
    db = sqlite3.connect(path)
    db.executescript(f"""
        CREATE TABLE FAMILY (FAMILY INTEGER, FAMILYNAME TEXT, FAMILYDES TEXT);
        CREATE TABLE UNIT (UNIT INTEGER, UNITNAME TEXT);
        CREATE TABLE PART (PART INTEGER, PARTNAME TEXT, PARTDES TEXT, FAMILY INTEGER, UNIT INTEGER,
                           BARCODE TEXT, TYPE TEXT);
        CREATE TABLE PARTDES (PART INTEGER, EPARTDES TEXT);
        CREATE TABLE PARTPARAM (PART INTEGER, SUP INTEGER);
        CREATE TABLE SUPPLIERS (SUP INTEGER, SUPNAME TEXT, SUPDES TEXT);
        CREATE TABLE PARTEXTFILE (PART INTEGER, EXTFILENUM INTEGER, EXTFILENAME TEXT);
        CREATE TABLE PARTSPECTYPES (NUMBER INTEGER, SPECDES TEXT);
        CREATE TABLE PARTSPEC (PART INTEGER, SPEC1 TEXT, SPEC2 TEXT, SPEC3 TEXT, SPEC4 TEXT, SPEC5 TEXT);
        CREATE TABLE PARTTEXT (PART INTEGER, TEXTORD INTEGER, TEXT TEXT);
        CREATE TABLE PARTTEXTLANG (PART INTEGER, TEXTORD INTEGER, TEXT TEXT);
        CREATE TABLE CURRENCIES (CURRENCY INTEGER, CODE TEXT);
        CREATE TABLE PRICELIST (PLIST INTEGER, PLNAME TEXT);
        CREATE TABLE PARTPRICE (PART INTEGER, PLIST INTEGER, PRICE REAL, CURRENCY INTEGER);
        CREATE TABLE CUSTOMERS (CUST INTEGER, CUSTNAME TEXT, CUSTDES TEXT);
        CREATE TABLE CUSTPARTPRICE (CUST INTEGER, PART INTEGER, PRICE REAL, CURRENCY INTEGER,
                                    FROMDATE {date}, EXPIRYDATE {date});
        CREATE TABLE CUSTPART (CUST INTEGER, PART INTEGER, CUSTPARTNAME TEXT);
        CREATE TABLE SUPPART (SUP INTEGER, PART INTEGER, SUPPARTNAME TEXT);
        CREATE TABLE PARTALT (PART INTEGER, ALT INTEGER, PARENT INTEGER, LN INTEGER);
        CREATE TABLE PARTARC (PART INTEGER, SON INTEGER, COEF REAL, SONQUANT REAL, FROMDATE {date}, TILLDATE {date});
    """)
    t = lambda s: stored(s, conn_type)  # noqa: E731
    d = lambda n: erp_day(day(n), conn_type)  # noqa: E731
    db.executemany("INSERT INTO FAMILY VALUES (?,?,?)", [(f, n, t(s)) for f, n, s in FAMILIES])
    db.executemany("INSERT INTO UNIT VALUES (?,?)", [(u, t(n)) for u, n in UNITS])
    db.executemany("INSERT INTO PART VALUES (?,?,?,?,?,?,?)",
                   [(i, k, t(n), f, u, b, ty) for i, k, n, f, u, b, ty in ITEMS])
    db.executemany("INSERT INTO PARTDES VALUES (?,?)", [(i, f"Foreign {k} & co") for i, k, *_ in ITEMS])
    db.executemany("INSERT INTO PARTPARAM VALUES (?,?)", [(i, 1 if i != 2 else 2) for i, *_ in ITEMS])
    db.executemany("INSERT INTO SUPPLIERS VALUES (?,?,?)", [(s, n, t(d_)) for s, n, d_ in SUPPLIERS])
    db.executemany("INSERT INTO PARTEXTFILE VALUES (?,?,?)",
                   [(1, -1, "..\\pics\\o'neil.png"), (1, 1, "..\\docs\\datasheet.pdf"), (2, -1, "/srv/pics/plain.png"),
                    (7, -1, "")])
    db.executemany("INSERT INTO PARTSPECTYPES VALUES (?,?)", [(n, t(s)) for n, s in SPEC_TYPES])
    db.execute("INSERT INTO PARTSPEC VALUES (1, ?, 'X2 & <y>', '', ?, NULL)", (t("אדום"), t("ארוך")))
    db.execute("INSERT INTO PARTSPEC VALUES (7, NULL, NULL, NULL, NULL, NULL)")
    db.executemany("INSERT INTO PARTTEXT VALUES (?,?,?)",
                   [(1, 2, t("שורה שנייה")), (1, 1, t("שורה <ראשונה> & יחידה"))])
    db.executemany("INSERT INTO PARTTEXTLANG VALUES (?,?,?)", [(1, 1, "First & <only> line")])
    db.executemany("INSERT INTO CURRENCIES VALUES (?,?)", [(c, t(s)) for c, s in CURRENCIES])
    db.executemany("INSERT INTO PRICELIST VALUES (?,?)", [(p, t(n)) for p, n in PRICELISTS])
    db.executemany("INSERT INTO PARTPRICE VALUES (?,?,?,?)", [(1, 2, 1234.5, 2), (1, 1, 12, 1), (1, 3, None, 1)])
    db.executemany("INSERT INTO CUSTOMERS VALUES (?,?,?)", [(c, n, t(s)) for c, n, s in CUSTOMERS])
    db.executemany("INSERT INTO CUSTPARTPRICE VALUES (?,?,?,?,?,?)",
                   [(1, 1, 10.25, 1, d(-10), d(10)), (2, 1, 9, 2, d(0), d(0)), (3, 1, 8, 1, d(-30), d(-1)),
                    (1, 1, 7, 1, d(1), d(30))])
    db.executemany("INSERT INTO CUSTPART VALUES (?,?,?)", [(1, 1, "CB-1"), (2, 1, None), (3, 1, "CC<1>")])
    db.executemany("INSERT INTO SUPPART VALUES (?,?,?)", [(2, 1, "S2-PN"), (1, 1, "S1-PN")])
    db.executemany("INSERT INTO PARTALT VALUES (?,?,?,?)", [(1, 3, 1, 2), (1, 4, 5, 1)])
    db.executemany("INSERT INTO PARTARC VALUES (?,?,?,?,?,?)",
                   [(1, 3, 1.0, 4.0, d(-100), d(365)), (1, 4, 1.0, 2.0, d(-400), d(-1)),
                    (1, 5, 1.0, 0.5, d(1), d(400)), (1, 4, 2.0, 1.5, d(0), d(0))])
    db.commit()
    db.close()
    os.makedirs(os.path.join(company, "..", "pics"), exist_ok=True)


def money(v):
    return f"{v:,.2f}"


def quantity(v):
    return f"{v:,.1f}"


def erp_expected(erp_path, key, conn_type, company):
    """The ERP card's texts in reading order, and its picture's file."""
    db = sqlite3.connect(erp_path)
    db.row_factory = sqlite3.Row
    txt = lambda v: erp_text(v, "", conn_type)  # noqa: E731
    # Codes (keys, currency codes) are shown as the ERP keeps them; texts in reading order.
    code = lambda v: "" if v is None else str(v)  # noqa: E731
    out = ["כרטיס פריט - פריוריטי/זום"]
    item = db.execute("SELECT P.*, F.FAMILYNAME, F.FAMILYDES, U.UNITNAME, PD.EPARTDES, S.SUPDES"
                      " FROM PART P, FAMILY F, UNIT U, PARTDES PD, PARTPARAM PP, SUPPLIERS S"
                      " WHERE P.PARTNAME = ? AND P.TYPE IN ('R', 'P') AND F.FAMILY = P.FAMILY AND U.UNIT = P.UNIT"
                      " AND PD.PART = P.PART AND PP.PART = P.PART AND S.SUP = PP.SUP", (key,)).fetchone()
    if item is None:
        return out + [COMPANY], None
    part = item["PART"]
    out += ["מקט", "תאור פריט", "משפחת מוצר", "ברקוד", item["PARTNAME"], txt(item["PARTDES"]),
            txt(item["FAMILYNAME"]) + " - " + txt(item["FAMILYDES"]), item["BARCODE"] or ""]
    out += ["יח מידה", "שם לועזי", "ספק מועדף", txt(item["UNITNAME"]), txt(item["EPARTDES"]), txt(item["SUPDES"])]
    picture = None
    row = db.execute("SELECT EXTFILENAME FROM PARTEXTFILE WHERE PART = ? AND EXTFILENUM = -1", (part,)).fetchone()
    if row and row[0]:
        name = row[0]
        picture = os.path.normpath(os.path.join(company, name.replace("\\", "/"))) if name.startswith("..") else name
    right = []
    names = {n: (txt(s) or f"פרמטר {n}") for n, s in db.execute("SELECT NUMBER, SPECDES FROM PARTSPECTYPES"
                                                                   " WHERE NUMBER > 0 ORDER BY NUMBER")}
    # The check's own parameter table holds the item, then one column per
    # parameter number, in order: a parameter's value is at its number.
    params = db.execute("SELECT * FROM PARTSPEC WHERE PART = ?", (part,)).fetchone()
    for n, name in names.items():
        value = txt(params[n]) if params else ""
        if value:
            right += [name + ":", value]
    he = [txt(r[0]) for r in db.execute("SELECT TEXT FROM PARTTEXT WHERE PART = ? ORDER BY TEXTORD", (part,))]
    if he:
        right += ["תאור בעברית:"] + he
    en = [txt(r[0]) for r in db.execute("SELECT TEXT FROM PARTTEXTLANG WHERE PART = ? ORDER BY TEXTORD", (part,))]
    if en:
        right += ["תאור באנגלית:"] + en
    if right:
        out += ["תאורים ופרמטרים נוספים"] + right

    def section(caption, columns, rows):
        if rows:
            out.extend([caption] + columns + [c for r in rows for c in r])

    section("מחירונים", ["מחירון", "מחיר", "מטבע"],
            [[txt(r[0]), money(r[1]), code(r[2])] for r in db.execute(
                "SELECT PL.PLNAME, PP.PRICE, CR.CODE FROM PARTPRICE PP, PRICELIST PL, CURRENCIES CR"
                " WHERE PP.PART = ? AND CR.CURRENCY = PP.CURRENCY AND PL.PLIST = PP.PLIST AND PP.PRICE IS NOT NULL"
                " ORDER BY PP.PLIST", (part,))])
    today = erp_day(TODAY, conn_type)
    section("מחירים מיוחדים", ["מפתח לקוח", "שם לקוח", "מחיר", "מטבע"],
            [[r[0], txt(r[1]), money(r[2]), code(r[3])] for r in db.execute(
                "SELECT C.CUSTNAME, C.CUSTDES, CPP.PRICE, CR.CODE FROM CUSTOMERS C, CUSTPARTPRICE CPP, CURRENCIES CR"
                " WHERE CPP.PART = ? AND CPP.EXPIRYDATE >= ? AND CPP.FROMDATE <= ? AND C.CUST = CPP.CUST"
                " AND CR.CURRENCY = CPP.CURRENCY ORDER BY C.CUSTNAME", (part, today, today))])
    section("מפתחות חליפיים", ["מפתח לקוח", "שם לקוח", "מפתח חליפי"],
            [[r[0], txt(r[1]), txt(r[2])] for r in db.execute(
                "SELECT C.CUSTNAME, C.CUSTDES, CP.CUSTPARTNAME FROM CUSTOMERS C, CUSTPART CP WHERE CP.PART = ?"
                " AND C.CUST = CP.CUST AND CP.CUSTPARTNAME IS NOT NULL ORDER BY C.CUSTNAME", (part,))])
    section("מפתחות חליפיים ספקים", ["מפתח ספק", "שם ספק", "מפתח חליפי"],
            [[r[0], txt(r[1]), txt(r[2])] for r in db.execute(
                "SELECT S.SUPNAME, S.SUPDES, SP.SUPPARTNAME FROM SUPPLIERS S, SUPPART SP WHERE SP.PART = ?"
                " AND S.SUP = SP.SUP AND SP.SUPPARTNAME IS NOT NULL ORDER BY S.SUPNAME", (part,))])
    section("פריטים חלופיים", ["מקט חליפי", "תאור מוצר", "מוצר אב", "תאור מוצר אב"],
            [[r[0], txt(r[1]), r[2], txt(r[3])] for r in db.execute(
                "SELECT A.PARTNAME, A.PARTDES, P.PARTNAME, P.PARTDES FROM PARTALT PA, PART A, PART P"
                " WHERE PA.PART = ? AND A.PART = PA.ALT AND P.PART = PA.PARENT ORDER BY PA.LN", (part,))])
    section("עצי מוצר", ["כמות האב", "מקט הבן", "שם הבן", "כמות הבן"],
            [[quantity(r[2]), r[0], txt(r[1]), quantity(r[3])] for r in db.execute(
                "SELECT P.PARTNAME, P.PARTDES, PA.COEF, PA.SONQUANT FROM PARTARC PA, PART P WHERE PA.PART = ?"
                " AND P.PART = PA.SON AND PA.TILLDATE >= ? AND PA.FROMDATE <= ? ORDER BY P.PARTNAME",
                (part, today, today))])
    return out + [COMPANY], picture


# ------------------------------------------------------------ the local card

LOCAL_ITEMS = [("O'NEIL-1", "בורג <ראש>", "10", "Bolt & nut", "יח'", 2.5, "7290000000015"),
               ("PLAIN-2", "Plain item", None, None, None, None, None)]
LOCAL_ITEMS += [(k, n, None, None, None, None, None) for _, k, n, *_ in ITEMS if k not in ("O'NEIL-1", "PLAIN-2")]
LOCAL_PRICES = [("O'NEIL-1", 2, 1234.5, "$"), ("O'NEIL-1", 1, 12, 'ש"ח'), ("O'NEIL-1", 3, None, "$")]
LOCAL_SPECIAL = [("C-B", "O'NEIL-1", 10.25, 'ש"ח'), ("C'A", "O'NEIL-1", 9, "$")]
LOCAL_ALTER = [("C-B", "O'NEIL-1", "CB-1", "BAR<1>"), ("C'A", "O'NEIL-1", "CA & 1", None)]
LOCAL_ACCOUNT = ("C'A", 2, "/labels/a&b.lbl", "/labels/second.lbl")


def fill_local(data):
    items = sqlite3.connect(os.path.join(data, "tgrmitm.tdb"))
    # Only the check's items: the selection lists them and nothing else.
    for table in ("tItems", "tPriceList", "tAlterPrices", "tAlterKeys"):
        items.execute(f"DELETE FROM {table}")
    items.executemany("INSERT INTO tItems (ItemKey, ItemName, ItemSort, Fname, Unit, Weight, BarCode, PrintLabel,"
                      " Copies) VALUES (?,?,?,?,?,?,?,0,1)", LOCAL_ITEMS)
    items.executemany("INSERT INTO tPriceList (ItemKey, PriceList, Price, Currency) VALUES (?,?,?,?)", LOCAL_PRICES)
    items.executemany("INSERT INTO tAlterPrices (AccountKey, ItemKey, Price, Coin) VALUES (?,?,?,?)", LOCAL_SPECIAL)
    items.executemany("INSERT INTO tAlterKeys (AccountKey, ItemKey, AlterNum, AlterBar) VALUES (?,?,?,?)",
                      LOCAL_ALTER)
    items.execute("INSERT INTO tAccountDef (DefID, AccountKey, PriceList, LabelName, Label2Name, Include)"
                  " VALUES ((SELECT COALESCE(MAX(DefID), 0) + 1 FROM tAccountDef), ?, ?, ?, ?, 1)", LOCAL_ACCOUNT)
    items.commit()
    items.close()
    docs = sqlite3.connect(os.path.join(data, "tgrrtdb.tmp"))
    docs.execute("DELETE FROM tPLName")
    docs.executemany("INSERT INTO tPLName (PLID, PLName) VALUES (?,?)", PRICELISTS)
    docs.commit()
    docs.close()


def local_expected(key, account):
    out = ["כרטיס פריט - תגורה של ונמר"]
    found = [i for i in LOCAL_ITEMS if i[0].lower() == key.lower()]
    if not found:
        return out + [COMPANY]
    k, name, sort, fname, unit, weight, bar = found[0]
    num = lambda v: "" if v is None else (str(int(v)) if float(v).is_integer() else str(v))  # noqa: E731
    out += ["מפתח פריט", "שם פריט", "מיון", "ברקוד", k, name, sort or "", bar or ""]
    out += ["יח מידה", "שם לועזי", "משקל", unit or "", fname or "", num(weight)]
    names = dict(PRICELISTS)
    prices = sorted((p for p in LOCAL_PRICES if p[0] == k and p[2] is not None and p[1] in names), key=lambda p: p[1])
    if prices:
        out += ["מחירונים", "מחירון", "מחיר", "מטבע"] + [c for p in prices for c in (names[p[1]], money(p[2]), p[3])]
    special = sorted((s for s in LOCAL_SPECIAL if s[1] == k), key=lambda s: s[0].lower())
    if special:
        out += ["מחירים מיוחדים", "מפתח חשבון", "מחיר", "מטבע"] + [c for s in special
                                                                  for c in (s[0], money(s[2]), s[3])]
    alter = sorted((a for a in LOCAL_ALTER if a[1] == k), key=lambda a: a[0].lower())
    if alter:
        out += ["מפתחות חליפיים", "מפתח חשבון", "מפתח חליפי", "ברקוד חליפי"] + [c for a in alter
                                                                             for c in (a[0], a[2], a[3] or "")]
    if account:
        a = LOCAL_ACCOUNT
        out += ["הגדרות לקוח/ספק", "מפתח חשבון", "מחירון", "מדבקה", "סיומת", a[0], str(a[1]), a[2], a[3]]
    return out + [COMPANY]


# ------------------------------------------------------------------ reading


class PageTexts(html.parser.HTMLParser):
    """The texts of a page's body in reading order, with the pictures' sources."""

    def __init__(self):
        super().__init__(convert_charrefs=True)
        self.texts, self.images, self.skip, self.body = [], [], 0, False

    def handle_starttag(self, tag, attrs):
        if tag == "body":
            self.body = True
        elif tag in ("script", "style", "title"):
            self.skip += 1
        elif tag == "img":
            self.images.append(dict(attrs).get("src", ""))

    def handle_endtag(self, tag):
        if tag in ("script", "style", "title"):
            self.skip -= 1

    def handle_data(self, data):
        text = data.strip().strip("\xa0").strip()
        if self.body and not self.skip and text:
            self.texts.append(text)


def read_page(path):
    raw = open(path, "rb").read()
    parser = PageTexts()
    parser.feed(raw.decode("cp1255"))
    return parser, raw


def picture_file(src):
    if src.startswith("file:"):
        return urllib.parse.unquote(urllib.parse.urlparse(src).path)
    return os.path.normpath(src) if src.startswith("/") else src


def compare(label, got, want):
    want = [w for w in want if w != ""]
    if got == want:
        return 0
    print(f"  {label}:")
    for line in difflib.unified_diff(want, got, "expected", "page", lineterm="", n=1):
        print("    " + line)
    return 1


def pages_of(stdout):
    return [line[len("page: "):] for line in stdout.splitlines() if line.startswith("page: ")]


def check_type(cli, work, conn_type):
    folder = os.path.join(work, f"type{conn_type}")
    env, ini, temp = private_host(folder)
    erp = os.path.join(folder, "erp.sqlite")
    write_odbc(folder, erp)
    # The demo company gives a data folder made the way an import makes it.
    run_cli(cli, env, ini, ["--demo", os.path.join(folder, "demo")])
    run_cli(cli, env, ini, ["click", "CmdImportItems"])
    data = os.path.join(folder, "demo", "data")
    fill_local(data)
    company = os.path.join(folder, "company")
    os.makedirs(company, exist_ok=True)
    make_erp(erp, conn_type, company)
    # The connection values point at the check's ERP instead of the demo's.
    replace_section(ini, "Params", ["ConnServer=CheckErp", "ConnUID=", "ConnPWD=", "ConnDataBase=check",
                                    f"ConnType={1 if conn_type == 2 else 0}", f"ConnPath={company}"])
    summary = []
    for typed in ["O'NEIL-1", "PLAIN-2", "עברי-7", "OTHER-6", "o'neil-1"]:
        find = ["click", "cmdSelectItems", "set", "txtToItemkey", typed, "click", "cmdFindKey"]
        r = run_cli(cli, env, ini, find + ["getcell", "VSSelectItems", "1", "1", "click", "cmdClose"])
        key = r.stdout.strip().splitlines()[-1] if r.stdout.strip() else ""
        for source, option in (("ERP", "OptItmCard(0)"), ("local", "OptItmCard(1)")):
            r = run_cli(cli, env, ini, find + ["set", option, "True", "clickcell", "VSSelectItems", "1", "0",
                                               "click", "cmdClose"])
            shown = pages_of(r.stdout)
            label = f"type {conn_type}: {source} card of {typed}"
            if len(shown) != 2 or not os.path.exists(shown[-1]):
                print(f"  {label}: pages {shown} ({r.stderr.strip()!r})")
                summary.append((label, 1))
                continue
            page, _ = read_page(shown[-1])
            if source == "ERP":
                want, picture = erp_expected(erp, key, conn_type, company)
                diffs = compare(label, page.texts, want)
                got_pictures = [picture_file(s) for s in page.images]
                if got_pictures != ([picture] if picture else []):
                    print(f"  {label}: pictures {got_pictures}, expected {[picture] if picture else []}")
                    diffs += 1
            else:
                diffs = compare(label, page.texts, local_expected(key, False))
            summary.append((label, diffs))
    # A host's call, with an account: the definition section, its second label file in the suffix column.
    for key in ["O'NEIL-1", "NO-SUCH", "<b>" + "x" * 200]:
        r = run_cli(cli, env, ini, ["call-info", "OpenItemHTML", key, os.path.join(data, "tgrrtdb.tmp"),
                                    LOCAL_ACCOUNT[0]])
        shown = pages_of(r.stdout)
        label = f"type {conn_type}: local card of {key[:24]} with an account"
        if len(shown) != 2:
            print(f"  {label}: pages {shown} ({r.stderr.strip()!r})")
            summary.append((label, 1))
            continue
        page, _ = read_page(shown[-1])
        summary.append((label, compare(label, page.texts, local_expected(key, True))))
    # An ERP that cannot be reached: the error page, never a hang.
    os.rename(erp, erp + ".gone")
    r = run_cli(cli, env, ini, ["click", "cmdSelectItems", "set", "txtToItemkey", "O'NEIL-1", "click", "cmdFindKey",
                                "set", "OptItmCard(0)", "True", "clickcell", "VSSelectItems", "1", "0",
                                "click", "cmdClose"])
    shown = pages_of(r.stdout)
    ok = len(shown) == 2 and os.path.basename(shown[-1]) == "vnierr1.htm"
    if ok:
        page, _ = read_page(shown[-1])
        ok = "התגלתה תקלה בקריאת הנתונים. להלן הודעת השגיאה:" in page.texts
    if not ok:
        print(f"  type {conn_type}: unreachable ERP: pages {shown}")
    summary.append((f"type {conn_type}: an unreachable ERP gives the error page", 0 if ok else 1))
    return summary


def main():
    args, work = check_arguments(__doc__, "cards-check-", conn_types=True)
    summary = []
    for conn_type in (int(t) for t in args.conn_types.split(",")):
        summary += check_type(args.cli, work, conn_type)
    return finish(summary, work, bool(args.keep))


if __name__ == "__main__":
    sys.exit(main())
