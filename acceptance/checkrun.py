"""What the acceptance checks share: the ERP's text in reading order, the
private ODBC data source, the settings file that points the headless host at
it, running the host, and the closing summary."""
import argparse
import os
import shutil
import subprocess
import tempfile


def is_hebrew(c):
    return "\u05d0" <= c <= "\u05ea"


def visual_to_logical(text, conn_type):
    """ERP text kept in display order, turned into reading order (types 0, 1)."""
    if conn_type not in (0, 1):
        return text
    mirror = {"(": ")", ")": "(", "[": "]", "]": "[", "{": "}", "}": "{"}
    result, run = "", ""
    for c in text:
        m = mirror.get(c, c)
        if c.isascii() and c.isalnum():
            run += m
        elif c in "+-./\\":
            if run:
                run += m
            else:
                result = m + result
        else:
            if run:
                result = run + result
                run = ""
            result = m + result
    if run:
        result = run + result
    return result


def erp_text(value, default, conn_type):
    if value is None or str(value) == "":
        return default
    text = str(value)
    if conn_type in (0, 1) and any(is_hebrew(c) for c in text):
        return visual_to_logical(text, conn_type)
    return text


# ------------------------------------------------------------------ the ERP


def check_arguments(doc, prefix, seed=None, conn_types=False, more=None):
    """The options every check takes (--cli, --keep; --seed and --conn-types
    where it has them; more(parser) adds its own) and its work folder.
    Gives (args, work)."""
    ap = argparse.ArgumentParser(description=doc.splitlines()[0])
    root = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
    ap.add_argument("--cli", default=os.path.join(root, "build", "app", "tagora-cli"))
    ap.add_argument("--keep", help="work in this folder and leave it behind")
    if seed is not None:
        ap.add_argument("--seed", type=int, default=seed)
    if conn_types:
        ap.add_argument("--conn-types", default="2,1", help="ERP connection types to check (1, 2)")
    if more:
        more(ap)
    args = ap.parse_args()
    args.cli = os.path.abspath(args.cli)
    work = os.path.abspath(args.keep or tempfile.mkdtemp(prefix=prefix))
    os.makedirs(work, exist_ok=True)
    return args, work


def private_host(folder):
    """A folder of the host's own: the ODBC drivers, data sources kept in it,
    the pages' Temp folder and no display. Gives (env, settings file, temp)."""
    os.makedirs(folder, exist_ok=True)
    shutil.copy("/etc/odbcinst.ini", os.path.join(folder, "odbcinst.ini"))
    temp = os.path.join(folder, "temp")
    os.makedirs(temp, exist_ok=True)
    env = dict(os.environ, ODBCSYSINI=folder, ODBCINI=os.path.join(folder, "user-odbc.ini"), Temp=temp,
               QT_QPA_PLATFORM="offscreen")
    return env, os.path.join(folder, "tagora.ini"), temp


def write_odbc(folder, erp_path):
    shutil.copy("/etc/odbcinst.ini", os.path.join(folder, "odbcinst.ini"))
    with open(os.path.join(folder, "odbc.ini"), "w") as f:
        f.write(f"[CheckErp]\nDriver=SQLite3\nDatabase={erp_path}\n")


def write_settings(path, data, conn_type, extra=""):
    with open(path, "w") as f:
        f.write("[Params]\nConnServer=CheckErp\nConnUID=\nConnPWD=\nConnDataBase=check\n"
                f"ConnType={1 if conn_type == 2 else 0}\nConnPath={os.path.dirname(path)}\n"
                f"[GeneralParams]\nDBPath={data}\n{extra}")


def replace_section(ini, section, lines):
    """Puts a settings section in place of the one the file holds."""
    kept, current = [], None
    for line in open(ini, encoding="utf-8").read().splitlines():
        if line.startswith("["):
            current = line.strip()
        if current != f"[{section}]":
            kept.append(line)
    with open(ini, "w", encoding="utf-8") as f:
        f.write("\n".join(kept + [f"[{section}]"] + lines) + "\n")


def run_cli(cli, env, ini, verbs, answer=None):
    args = [cli, "--settings", ini] + (["--answer", answer] if answer else []) + verbs
    return subprocess.run(args, env=env, capture_output=True, text=True, timeout=600)


def finish(summary, work, keep):
    """Prints the summary of (label, differences); the work folder goes only
    when everything agreed and it was not asked to stay. The exit status."""
    total = sum(n for _, n in summary)
    print("\nSummary")
    for label, n in summary:
        print(f"  {'ok  ' if n == 0 else 'DIFF'} {label}" + (f" ({n})" if n else ""))
    if not keep and total == 0:
        shutil.rmtree(work, ignore_errors=True)
        print(f"  {total} differences")
    else:
        print(f"  {total} differences; the files are in {work}")
    return 0 if total == 0 else 1
