"""Every link of every page leads to a file of this tree and to a heading that is there; those of an
installed page lead to others that are installed."""

import pathlib
import re
import sys

ROOT = pathlib.Path(__file__).resolve().parents[1]


def anchors(page):
    headings = re.findall(r"^#+ (.*)$", page.read_text(), re.MULTILINE)
    return {re.sub(r"[^\w\- ]", "", heading.lower()).replace(" ", "-") for heading in headings}


def installed():
    rule, = re.findall(r"install\(FILES (.*?)\sDESTINATION",
                       (ROOT / "doc/CMakeLists.txt").read_text(), re.DOTALL)
    return {ROOT / "doc" / name for name in rule.split()}


def broken(page):
    reachable = installed()
    for link in re.findall(r"\]\(([^)\s]+)\)", page.read_text()):
        path, _, anchor = link.partition("#")
        target = page.parent / path if path else page
        if not re.match(r"\w+:", link) and (
                not target.exists() or anchor and anchor not in anchors(target)
                or page in reachable and target not in reachable):
            yield f"{page.relative_to(ROOT)}: {link}"


def main():
    pages = [page for folder in (".", "doc", "tests/vectors", "examples", "packaging")
             for page in (ROOT / folder).glob("*.md")]
    sys.exit("\n".join(link for page in pages for link in broken(page)) or 0)


if __name__ == "__main__":
    main()
