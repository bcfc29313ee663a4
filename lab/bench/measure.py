"""How the benchmark measures: time in turns, instructions by callgrind, whole processes."""
import os
import re
import statistics
import subprocess
import tempfile


class Programs:
    """The programs of a build folder, and the material that they work on."""

    def __init__(self, folder, material):
        self.folder = folder
        self.material = material

    def path(self, name):
        return os.path.join(self.folder, name)

    def peers(self):
        return [name for name in ("libjwt", "cjose", "rhonabwy")
                if os.path.exists(self.path("peer_" + name))]

    def nanoseconds(self, program, operation, times):
        output = subprocess.run(
            [self.path(program), self.material, "time", "%s:%d" % (operation, times)],
            check=True, stdout=subprocess.PIPE, text=True).stdout
        return float(output)

    def in_turns(self, operation, programs, rounds, batch=0.02):
        """Median nanoseconds of each, and median ratio of each to the first."""
        first = self.nanoseconds(programs[0], operation, 1)
        times = max(1, int(batch * 1e9 / first))
        taken = [[self.nanoseconds(program, operation, times) for program in programs]
                 for _ in range(rounds)]
        return [(statistics.median(row[i] for row in taken),
                 statistics.median(row[i] / row[0] for row in taken))
                for i in range(len(programs))]

    def first_instructions(self, program, operation):
        """Instructions for an operation that is the first of its process."""
        return self.instructions(program, [operation], 1, "first")[operation]

    def instructions(self, program, operations, times=2, way="count"):
        """Instructions for one of each operation."""
        with tempfile.TemporaryDirectory() as folder:
            callgrind([self.path(program), self.material, way] +
                      ["%s:%d" % (operation, times) for operation in operations],
                      folder + "/out")
            counts = {}
            for name in os.listdir(folder):
                with open(os.path.join(folder, name)) as file:
                    text = file.read()
                trigger = re.search(r"^desc: Trigger: Client Request: (\S+)$", text, re.M)
                if trigger:
                    counts[trigger.group(1)] = total(text) / times
        missing = set(operations) - set(counts)
        if missing:
            raise RuntimeError("%s was not counted in %s" % (missing, program))
        return counts


def callgrind(command, out, environment=None):
    subprocess.run(["valgrind", "--tool=callgrind", "--callgrind-out-file=" + out] + command,
                   check=True, stdout=subprocess.DEVNULL, stderr=subprocess.PIPE,
                   env=environment)


def total(text):
    return int(re.search(r"^(?:totals|summary): (\d+)", text, re.M).group(1))


def process_instructions(command):
    """Instructions of a whole process, the dynamic linker's included."""
    with tempfile.TemporaryDirectory() as folder:
        callgrind(command, folder + "/out")
        with open(folder + "/out") as file:
            return total(file.read())


class Process:
    """What a program took: medians over the rounds, ratios to the first program of each round."""

    def __init__(self, rows, first, peak):
        self.milliseconds = statistics.median(row[0] for row in rows) / 1000
        self.ratio = statistics.median(row[0] / base[0] for row, base in zip(rows, first))
        self.processor_ratio = statistics.median(
            row[1] / max(base[1], 1) for row, base in zip(rows, first))
        self.peak = peak


def processes(runner, rounds, commands):
    """Runs the commands in turn."""
    arguments = [runner, str(rounds)]
    for command in commands:
        arguments += ["--"] + command
    lines = subprocess.run(arguments, check=True, stdout=subprocess.PIPE,
                           text=True).stdout.splitlines()
    taken = [[int(number) for number in line.split()] for line in lines[:-1]]
    pairs = [[(row[2 * i], row[2 * i + 1]) for row in taken] for i in range(len(commands))]
    return [Process(rows, pairs[0], int(peak))
            for rows, peak in zip(pairs, lines[-1].split())]


def shared_object(path):
    """Size when stripped, relocations bound by name, function slots, foreign exports."""
    with tempfile.NamedTemporaryFile() as stripped:
        subprocess.run(["strip", "-o", stripped.name, path], check=True)
        size = os.path.getsize(stripped.name)
    named, slots = relocations(path)
    symbols = subprocess.run(["nm", "-D", "--defined-only", path], check=True,
                             capture_output=True, text=True).stdout
    names = [line.split()[2] for line in symbols.splitlines() if line.split()[1] != "A"]
    return size, named, slots, sum("4QOVA" not in name for name in names)


def relocations(path):
    """Relocations by name: of data, and of functions (the procedure linkage table)."""
    table = subprocess.run(["readelf", "-rW", path], check=True, stdout=subprocess.PIPE,
                           text=True).stdout
    kinds = [line.split()[2] for line in table.splitlines()
             if re.match(r"[0-9a-f]{8,} ", line) and "RELATIVE" not in line]
    slots = sum("JUMP_SLO" in kind for kind in kinds)
    return len(kinds) - slots, slots
