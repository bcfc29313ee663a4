"""Small defects, made from the sources by regular rules: the same sources give the same ones."""
import hashlib
import re
from pathlib import Path

class Mutant:
    """One defect: in `path`, the lines `old`, from number `line` on, become the lines `new`."""

    def __init__(self, path, line, old, new, what):
        self.path, self.line, self.old, self.new, self.what = path, line, old, new, what
        self.marks = set()
        self.name = ""

    def apply(self, text):
        lines = text.split("\n")
        lines[self.line - 1:self.line - 1 + len(self.old)] = self.new
        return "\n".join(lines)


def name_all(mutants):
    """Names that stay when lines and files move: from the file, the text, and how often both came before."""
    seen = {}
    for mutant in mutants:
        key = "\0".join([mutant.path.replace("internal/", "")] + ["\n".join(part).strip() for part in (mutant.old, mutant.new)])
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


def generate(root, sources, declarations):
    """The defects by rule. Of headers that are mostly declarations, only constants and defaults."""
    mutants = []
    for path in sources:
        in_comment = False
        for number, line in enumerate((Path(root) / path).read_text().split("\n"), 1):
            masked, in_comment = without_literals(line, in_comment)
            if re.match(r"\s*(#|using |namespace |static_assert|template|enum |private:|public:)", masked):
                continue
            for new, what in changes(line, masked, path in declarations):
                mutants.append(Mutant(path, number, [line], [new], what))
    return name_all(mutants)


def words(line):
    return " ".join(line.split())


def places(text, old):
    """The numbers of the lines in `text` where the lines `old` are, whatever the spaces."""
    lines, wanted = [words(line) for line in text.split("\n")], [words(line) for line in old]
    return [i + 1 for i in range(len(lines)) if lines[i:i + len(wanted)] == wanted]


def read_by_hand(root, file, sources):
    """The small patches of by-hand.diff. Returns those that fit the sources, and those that are stale."""
    fitting, stale, path = [], [], None
    for line in Path(file).read_text().split("\n"):
        if line.startswith("--- "):
            path = line[4:]
        elif path and line.startswith("= "):
            marks = re.search(r" \[(\w+)\]$", line)
            mutant = Mutant(path, 0, [], [], line[2:marks.start()] if marks else line[2:])
            mutant.marks = {marks.group(1)} if marks else set()
            stale.append(mutant)
        elif path and line:
            if line[0] != "+":
                mutant.old.append(line[1:])
            if line[0] != "-":
                mutant.new.append(line[1:])
    name_all(stale)
    texts = {source: (Path(root) / source).read_text() for source in sources}
    for mutant in list(stale):
        found = [(source, line) for source in sorted(texts, key=lambda s: s != mutant.path)
                 for line in places(texts[source], mutant.old)]
        own = [place for place in found if place[0] == mutant.path]
        if len(own or found) == 1:
            mutant.path, mutant.line = (own or found)[0]
            fitting.append(mutant)
            stale.remove(mutant)
    return fitting, stale
