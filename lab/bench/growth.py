"""How cost grows with the size of tokens, key sets and answers, in instructions; and the picture."""
import math

TOKENS = [1 << 10, 1 << 12, 1 << 14, 1 << 16, 1 << 18, 1 << 20]
KEYS = [1, 10, 100, 300, 1000]
ANSWERS = [1 << 10, 10 << 10, 100 << 10, 1 << 20, 10 << 20]


class Curve:
    """One picture: sizes, and the counts of the library, of the floor and of the parser alone."""

    def __init__(self, title, unit, sizes, operation, parser=None, first=False):
        self.title = title
        self.unit = unit
        self.sizes = sizes
        self.operation = operation
        self.parser = parser
        self.first = first
        self.lines = {}

    def measure(self, programs):
        for label, program, operation in (("library", "bench_library", self.operation),
                                          ("by hand", "bench_floor", self.operation),
                                          ("parser", "bench_floor", self.parser)):
            if operation is not None:
                self.lines[label] = self.line(programs, program,
                                              [operation % size for size in self.sizes])
        return self

    def line(self, programs, program, operations):
        if self.first:
            return [programs.first_instructions(program, name) for name in operations]
        counts = programs.instructions(program, operations, 1)
        return [counts[name] for name in operations]

    def slope(self, label, start=0):
        """Instructions for one more byte or key, from sizes[start] to the largest."""
        line = self.lines[label]
        return (line[-1] - line[start]) / (self.sizes[-1] - self.sizes[start])


def measure_all(programs):
    return [curve.measure(programs) for curve in (
        Curve("a token, parsed and verified", "bytes of token", TOKENS, "check-rs256-%d"),
        # How much a parse costs depends on what malloc has been used for: a login program's is new.
        Curve("the first login of a process", "keys in the key set", KEYS, "login-keys-%d",
              "parse-keys-%d", first=True),
        Curve("a request", "bytes of answer", ANSWERS, "answer-%d"))]


WIDTH, HEIGHT, LEFT, BOTTOM, TOP = 300, 240, 60, 40, 30
COLOURS = {"library": "#c03030", "by hand": "#3050a0", "parser": "#409040"}


def picture(curves):
    """The curves side by side, on logarithmic axes."""
    parts = ['<svg xmlns="http://www.w3.org/2000/svg" width="%d" height="%d" '
             'font-family="sans-serif" font-size="11">' % ((WIDTH + LEFT + 20) * len(curves),
                                                          HEIGHT + TOP + BOTTOM),
             '<rect width="100%" height="100%" fill="white"/>']
    for index, curve in enumerate(curves):
        parts.append('<g transform="translate(%d,%d)">' % (
            index * (WIDTH + LEFT + 20) + LEFT, TOP))
        parts += panel(curve)
        parts.append("</g>")
    return "\n".join(parts + ["</svg>"]) + "\n"


def panel(curve):
    counts = [count for line in curve.lines.values() for count in line]
    across = axis(min(curve.sizes), max(curve.sizes), 0, WIDTH)
    up = axis(10 ** math.floor(math.log10(min(counts))), 10 ** math.ceil(math.log10(max(counts))),
              HEIGHT, 0)
    parts = ['<rect width="%d" height="%d" fill="none" stroke="#888"/>' % (WIDTH, HEIGHT),
             text(WIDTH / 2, -12, "instructions for " + curve.title, "middle"),
             text(WIDTH / 2, HEIGHT + 32, curve.unit, "middle")]
    for size in curve.sizes:
        parts.append(text(across(size), HEIGHT + 15, short(size), "middle"))
    power = math.floor(math.log10(min(counts)))
    while power <= math.ceil(math.log10(max(counts))):
        parts.append(text(-5, up(10 ** power) + 4, "10^%d" % power, "end"))
        power += 1
    for number, (label, line) in enumerate(curve.lines.items()):
        points = " ".join("%.1f,%.1f" % (across(size), up(count))
                          for size, count in zip(curve.sizes, line))
        parts.append('<polyline points="%s" fill="none" stroke="%s" stroke-width="%s"/>' % (
            points, COLOURS[label], 3 if label == "by hand" else 1.5))
        parts.append('<text x="10" y="%d" fill="%s">%s</text>' % (
            18 + 15 * number, COLOURS[label], label))
    return parts


def axis(low, high, begin, end):
    """Maps low..high to begin..end, logarithmically."""
    span = math.log(high / low)
    return lambda value: begin + (end - begin) * math.log(value / low) / span


def text(x, y, what, anchor):
    return '<text x="%.1f" y="%.1f" text-anchor="%s">%s</text>' % (x, y, anchor, what)


def short(size):
    if size >= 1 << 20:
        return "%dM" % (size >> 20)
    return "%dK" % (size >> 10) if size >= 1 << 10 else str(size)
