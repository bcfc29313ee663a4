"""Small defects, made from the sources by regular rules: the same sources give the same ones."""
import hashlib
import re
from pathlib import Path

SOURCES = [
    "sso/azuresso.cpp", "sso/jwt.cpp", "sso/profile.cpp", "sso/sso.cpp", "sso/utils.cpp",
    "sso/webspheresso.cpp", "sso/common.cpp", "sso/internal/provider.cpp",
    "sso/internal/encoding.cpp", "sso/internal/file.cpp", "sso/internal/json.cpp",
    "sso/internal/libcurl.cpp", "sso/internal/http_body.h", "sso/internal/nonce.cpp",
    "sso/privilege.h", "sso/internal/split.h", "sso/common.h", "sso/sso.h", "sso/profile.h", "sso/azuresso.h",
    "platform/encoding.c", "platform/passthrough.c",
]
# Headers that are mostly declarations: their constants and defaults alone are changed.
DECLARATIONS = {"sso/common.h", "sso/sso.h", "sso/profile.h", "sso/azuresso.h"}


class Mutant:
    """One defect: in `path`, the lines `old` (from line number `line`) become `new`."""

    def __init__(self, path, line, old, new, what):
        self.path, self.line, self.old, self.new, self.what = path, line, old, new, what
        self.marks = set()
        self.name = ""

    def apply(self, text):
        lines = text.split("\n")
        count = self.old.count("\n") + 1
        assert "\n".join(lines[self.line - 1:self.line - 1 + count]) == self.old, self.what
        lines[self.line - 1:self.line - 1 + count] = self.new.split("\n")
        return "\n".join(lines)


def name_all(mutants):
    """Names that stay when lines move: from the text, and from how often the same came before."""
    seen = {}
    for mutant in mutants:
        key = "\0".join([mutant.path, mutant.old.strip(), mutant.new.strip()])
        seen[key] = seen.get(key, 0) + 1
        digest = hashlib.sha256((key + "\0%d" % seen[key]).encode()).hexdigest()
        mutant.name = digest[:8]
    return mutants


# What is neither comment nor literal stays; the rest becomes "#" of the same length.
TOKEN = re.compile(r'"(?:\\.|[^"\\])*"|\'(?:\\.|[^\'\\])*\'|//.*|/\*.*?(?:\*/|$)')

SWAPS = [
    (r" == ", " != ", "an equality turned"),
    (r" != ", " == ", "an inequality turned"),
    (r" < ", " <= ", "a border moved"),
    (r" <= ", " < ", "a border moved"),
    (r" > ", " >= ", "a border moved"),
    (r" >= ", " > ", "a border moved"),
    (r" < ", " > ", "a comparison turned"),
    (r" > ", " < ", "a comparison turned"),
    (r" && ", " || ", "and made or"),
    (r" \|\| ", " && ", "or made and"),
    (r"\btrue\b", "false", "true made false"),
    (r"\bfalse\b", "true", "false made true"),
    (r" \+ ", " - ", "a sum made a difference"),
    (r" - ", " + ", "a difference made a sum"),
    (r" % ", " / ", "a remainder made a quotient"),
    (r" >> ", " << ", "a shift turned"),
    (r" << ", " >> ", "a shift turned"),
    (r" & ", " | ", "bitwise and made or"),
    (r"std::max\b", "std::min", "the larger made the smaller"),
    (r"\bLOG_ERR\b", "LOG_WARNING", "another log priority"),
    (r"\bLOG_INFO\b", "LOG_NOTICE", "another log priority"),
    (r"\bLOG_AUTH \| ", "", "no log facility"),
    (r" \| O_CLOEXEC\b", "", "a flag dropped"),
    (r"\bsso_err_resp\(", "sso_op_failed(", "another exception"),
    (r"\bsso_op_failed\(", "sso_err_resp(", "another exception"),
    (r"\bsso_exception\(", "sso_op_failed(", "another exception"),
    (r"throw std::invalid_argument\(", "throw std::domain_error(", "another exception"),
    (r"throw std::logic_error\(", "throw std::invalid_argument(", "another exception"),
    (r"\bcontinue;", "break;", "continue made break"),
    (r"\bbreak;", "continue;", "break made continue"),
]
SWAPS = [(re.compile(old), new, what) for old, new, what in SWAPS]
NUMBER = re.compile(r"(?<![\w.])(\d+)(?=[L)\];,:+}\s]|$)")
CONDITION = re.compile(r"\b(if|while) \((?!.*(?:==|!=|<|>))(.*)\) (.*)$")
GUARDED = re.compile(r"^\s*if \(.*\) (?:return|throw|continue|close|syslog)\b.*;$")
STATEMENT = re.compile(r"^\s*(?:\(void\))?[*A-Za-z_][\w.:>\[\]*-]*(?:\(.*\)(?:\..*)?|\+\+ = .*| \+?= .*);$")


def balanced(text):
    return text.count("(") == text.count(")") and text.count("{") == text.count("}")


def without_literals(line, in_comment):
    if in_comment:
        end = line.find("*/")
        return ("#" * len(line), True) if end < 0 else ("#" * (end + 2) + line[end + 2:], False)
    opened = "/*" in TOKEN.sub(lambda m: m.group() if m.group().startswith("/*") else "", line)
    masked = TOKEN.sub(lambda m: "#" * len(m.group()), line)
    return masked, opened and "*/" not in line


def literal_changes(line):
    for match in TOKEN.finditer(line):
        text = match.group()
        if text.startswith('"') and text != '""':
            yield match, text[:-1] + '~"', "another text"
        elif text.startswith("'"):
            yield match, "'\\1'" if text == "'\\0'" else "'~'", "another character"


def changes(line, masked, declarations):
    """Each (new line, description) for one line of code."""
    for match, new, what in literal_changes(line):
        yield line[:match.start()] + new + line[match.end():], what
    for match in NUMBER.finditer(masked):
        number = int(match.group())
        yield line[:match.start()] + str(number + 1) + line[match.end():], "a number larger by one"
        if number == 1:
            yield line[:match.start()] + "0" + line[match.end():], "one made zero"
    for old, new, what in SWAPS:
        if declarations and "true" not in new and "false" not in new:
            continue
        for match in old.finditer(masked):
            yield line[:match.start()] + new + line[match.end():], what
    if declarations:
        return
    found = CONDITION.search(masked)
    if found and balanced(found.group(2)):
        start, end = found.span(2)
        inner = line[start:end]
        if inner.startswith("!") and " " not in inner:
            yield line[:start] + inner[1:] + line[end:], "a condition turned"
        else:
            yield line[:start] + "!(" + inner + ")" + line[end:], "a condition turned"
    indent = line[:len(line) - len(line.lstrip())]
    if GUARDED.match(masked) and balanced(masked):
        yield indent + ";", "a check dropped"
    elif STATEMENT.match(masked) and balanced(masked) and "override" not in masked:
        yield indent + ";", "a statement dropped"


def generate(root):
    mutants = []
    for path in SOURCES:
        in_comment = False
        for number, line in enumerate((Path(root) / path).read_text().split("\n"), 1):
            masked, in_comment = without_literals(line, in_comment)
            if re.match(r"\s*(#|using |namespace |static_assert|template|enum |private:|public:)", masked):
                continue
            for new, what in changes(line, masked, path in DECLARATIONS):
                mutants.append(Mutant(path, number, line, new, what))
    return name_all(mutants)


def read_by_hand(root, file):
    """Blocks of "== PATH: DESCRIPTION [MARKS]", the lines as they are, "--", the lines instead."""
    mutants = []
    for block in re.split(r"^== ", Path(file).read_text(), flags=re.M)[1:]:
        head, rest = block.split("\n", 1)
        path, what = head.split(": ", 1)
        marks = re.search(r" \[([\w ]+)\]$", what)
        old, new = rest.split("\n--\n")
        new = new.rstrip("\n")
        text = (Path(root) / path).read_text()
        if text.count("\n" + old + "\n") != 1:
            raise SystemExit("%s: not found once in %s:\n%s" % (file, path, old))
        line = text[:text.index("\n" + old + "\n") + 1].count("\n") + 1
        mutant = Mutant(path, line, old, new, what[:marks.start()] if marks else what)
        mutant.marks = set(marks.group(1).split()) if marks else set()
        mutants.append(mutant)
    return name_all(mutants)
