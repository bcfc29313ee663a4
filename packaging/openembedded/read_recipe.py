"""Reads a recipe or a layer's configuration far enough to check it without bitbake.

  read_recipe.py FILE [VARIABLE]

Ends with status 1 and a line that tells where when FILE holds something that is neither a comment,
an assignment with closed quotes, an "inherit" nor a whole shell function; and when VARIABLE is not set.
"""

import re
import sys

NAME = r"[A-Za-z0-9_:.${}+/-]+"
ASSIGNMENT = re.compile(
    rf"^(?P<name>{NAME})(\[(?P<flag>[A-Za-z0-9_-]+)\])?\s*"
    r"(?P<operator>\?\?=|\?=|:=|\+=|=\+|\.=|=\.|=)\s*(?P<quote>[\"'])(?P<value>.*)(?P=quote)$")
FUNCTION = re.compile(rf"^{NAME}\s*\(\s*\)\s*\{{$")
INHERIT = re.compile(r"^inherit( [a-z0-9-]+)+$")


def read(path):
    """The variables of a file; raises ValueError with the place of a fault."""
    values = {}
    lines = enumerate(open(path, encoding="utf-8").read().split("\n"), 1)
    for number, line in lines:
        start = number
        while line.endswith("\\"):
            number, more = next(lines, (number, None))
            if more is None:
                raise ValueError(f"{path}:{start}: goes on behind the end")
            line = line[:-1] + more
        if not line.strip() or line.startswith("#") or INHERIT.match(line):
            continue
        if FUNCTION.match(line):
            if not any(text == "}" for _, text in lines):
                raise ValueError(f"{path}:{start}: the function has no end")
            continue
        found = ASSIGNMENT.match(line)
        if found is None or found["quote"] in found["value"]:
            raise ValueError(f"{path}:{start}: not understood: {line}")
        name = found["name"] + (f"[{found['flag']}]" if found["flag"] else "")
        added = found["operator"] in ("+=", "=+", ".=", "=.")
        values[name] = (values.get(name, "") + " " if added else "") + found["value"]
    return values


def main():
    try:
        values = read(sys.argv[1])
        if len(sys.argv) > 2:
            print(values[sys.argv[2]].strip())
    except ValueError as error:
        sys.exit(str(error))
    except KeyError as error:
        sys.exit(f"{sys.argv[1]}: {error} is not set")


if __name__ == "__main__":
    main()
