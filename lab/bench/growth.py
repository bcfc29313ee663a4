"""How cost grows with the size of tokens, key sets and answers, in instructions."""

TOKENS = [1 << 10, 1 << 12, 1 << 14, 1 << 16, 1 << 18, 1 << 20]
KEYS = [1, 10, 100, 300, 1000]
ANSWERS = [1 << 10, 10 << 10, 100 << 10, 1 << 20, 10 << 20]


class Curve:
    """One table: sizes, and the counts of the library, of the floor and of the parser alone."""

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
                                          ("baseline", "bench_floor", self.operation),
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
