"""Finds the small faults that can be put into a C++ source.

Relies on the layout of clang-format: there are blanks around a binary operator, but not around the
brackets of a template.
"""

import random
import re
from dataclasses import dataclass

LITERAL_OR_COMMENT = re.compile(
    r"""//[^\n]*|/\*.*?\*/|R"\(.*?\)"|"(?:\\.|[^"\\\n])*"|'(?:\\.|[^'\\\n])'""", re.S)
NOT_CODE = re.compile(r"^#(?!define \w+\().*$", re.M)
# Escapes and conversions in a text are changed as a whole.
UNIT = re.compile(r"\\[0-7]{1,3}|\\.|%[-+ #0-9.*hlz]*[a-zA-Z%]|.", re.S)
SHORT_LINE = 30
BEFORE_CONDITION = re.compile(r"[,;?]|(?<![=!<>])= ")
NUMBER = re.compile(r"(?<![\w.])(0x[0-9a-fA-F]+|\d+)(\.\d+)?([uUlL]*)(?![\w.])")
LEVEL = re.compile(r"\bDR_LOG(?:_AS)?\((?:[\w\"]+, )?(Err|Warn|Notice|Info|Debug)\b")
NEXT_LEVEL = {"Err": "Warn", "Warn": "Notice", "Notice": "Info", "Info": "Debug", "Debug": "Err"}
SWAPS = [
    ("limit", r"(?<=\w |\) |\] )<(?=\s)", "<="), ("limit", r"(?<=\s)<=(?=\s)", "<"),
    ("limit", r"(?<=\s)>(?=\s)", ">="), ("limit", r"(?<=\s)>=(?=\s)", ">"),
    ("equality", r"(?<=\s)==(?=\s)", "!="), ("equality", r"(?<=\s)!=(?=\s)", "=="),
    ("and/or", r"(?<=\s)&&(?=\s)", "||"), ("and/or", r"(?<=\s)\|\|(?=\s)", "&&"),
    ("and/or", r"(?<=\s)\|(?=\s)", "&"), ("and/or", r"(?<=\s)&(?=\s)", "|"),
    ("boolean", r"\btrue\b", "false"), ("boolean", r"\bfalse\b", "true"),
    ("step", r"\+\+", "--"), ("step", r"--", "++"),
    ("negation", r"!(?=[\w(:*])", ""),
]
STATEMENT = re.compile(r"(?<=[;{}):])\s*\n {4,}(?=\w|::|\*|\(|\+\+)|(?<=\) )(?=\w|::)")
NO_STATEMENT = re.compile(
    r"(?:return\b(?!;)|case|default|using|template|static_assert|const|constexpr|struct|enum|class|"
    r"else|static)\b"
    r"|[\w:]+(?:<[^;=()]*>)?[\s*&]+\w+\s*[;={(\[]")  # a declaration


@dataclass(frozen=True)
class Fault:
    kind: str
    begin: int
    end: int
    new: str

    def apply(self, text):
        return text[:self.begin] + self.new + text[self.end:]

    def line(self, text):
        return text.count("\n", 0, self.begin) + 1

    def change(self, text):
        """The changed lines before and after, with single blanks.

        A short line, which may occur several times, comes with the line before it.
        """
        begin = text.rfind("\n", 0, self.begin) + 1
        end = text.find("\n", self.end)
        if len(text[begin:end].strip()) < SHORT_LINE:
            begin = text.rfind("\n", 0, max(0, begin - 1)) + 1
        after = text[begin:self.begin] + self.new + text[self.end:end]
        return " ".join(text[begin:end].split()), " ".join(after.split())


def blanked(text):
    """The text with comments, contents of literals and directives blanked out."""
    def blank(match):
        found = match.group()
        kept = re.sub(r"[^\n]", " ", found)
        return kept if found.startswith("/") else found[0] + kept[1:-1] + found[-1]
    return NOT_CODE.sub(lambda match: " " * len(match.group()),
                        LITERAL_OR_COMMENT.sub(blank, text))


def closing(code, at, stops):
    """The first place after `at` with one of `stops` outside of later brackets; -1 without one."""
    depth = 0
    for place in range(at, len(code)):
        if depth == 0 and code[place] in stops:
            return place
        if code[place] in "([{":
            depth += 1
        elif code[place] in ")]}":
            depth -= 1
            if depth < 0:
                return -1
    return -1


def opening(code, at):
    """The start of the condition before the "?" at `at`."""
    depth = 0
    for place in range(at - 1, 0, -1):
        if code[place] in ")]}":
            depth += 1
        elif code[place] in "([{":
            depth -= 1
        if depth < 0 or depth == 0 and BEFORE_CONDITION.match(code, place):
            return place + 1
        if depth == 0 and re.match(r"\breturn\b", code[place:place + 7]):
            return place + len("return ")
    return -1


def numbers(code, rng):
    for match in NUMBER.finditer(code):
        digits, fraction, suffix = match.group(1), match.group(2) or "", match.group(3)
        if digits.startswith("0x"):
            base, shape = 16, "0x{:x}"
        elif digits.startswith("0") and len(digits) > 1:
            base, shape = 8, "0{:o}"
        else:
            base, shape = 10, "{}"
        value = int(digits, base)
        value += rng.choice([1, -1]) if value > 0 else 1
        yield Fault("constant", *match.span(), shape.format(value) + fraction + suffix)


def literals(text, code, rng):
    for match in LITERAL_OR_COMMENT.finditer(text):
        begin, end = match.span()
        if match.group().startswith("'"):
            yield Fault("message", begin, end, "'x'" if match.group() != "'x'" else "'y'")
        elif match.group().startswith('"') and code[begin] == '"':
            units = [unit for unit in UNIT.finditer(text, begin + 1, end - 1)
                     if len(unit.group()) == 1]
            if units:
                unit = rng.choice(units)
                yield Fault("message", *unit.span(), "y" if unit.group() == "x" else "x")
            else:
                yield Fault("message", end - 1, end - 1, "x")


def conditions(code):
    for match in re.finditer(r"\b(?:if|while) \(", code):
        end = closing(code, match.end(), ")")
        if end > 0 and code[match.end():end] not in ("true", "false"):
            yield match.end(), end
    for match in re.finditer(r"\s\?\s", code):
        begin = opening(code, match.start())
        if begin > 0:
            yield begin, match.start()


def results(code):
    for match in re.finditer(r"\breturn (?!true;|false;|\{\};|nullptr;|-?\d+;)", code):
        end = closing(code, match.end(), ";")
        if end > 0:
            yield match.end(), end


def statements(code):
    for match in STATEMENT.finditer(code):
        begin = match.end()
        end = closing(code, begin, ";{")
        if end > 0 and code[end] == ";" and not NO_STATEMENT.match(code, begin):
            yield begin, end


def negated(text, begin, end):
    return f"!({text[begin:end].strip()})"


def find(text, seed):
    """All faults of a source, in an order that depends on the seed."""
    rng = random.Random(f"{seed}")
    code = blanked(text)
    found = [*numbers(code, rng), *literals(text, code, rng)]
    for kind, pattern, new in SWAPS:
        found += [Fault(kind, *match.span(), new) for match in re.finditer(pattern, code)]
    found += [Fault("level", *match.span(1), NEXT_LEVEL[match.group(1)])
              for match in LEVEL.finditer(code)]
    for begin, end in conditions(code):
        found.append(Fault("condition", begin, end, negated(text, begin, end)))
    for begin, end in results(code):
        found.append(Fault("result", begin, end, negated(text, begin, end)))
        found.append(Fault("result", begin, end, "{}"))
    found += [Fault("statement", begin, end, "") for begin, end in statements(code)]
    found = sorted(set(found), key=lambda fault: (fault.begin, fault.end, fault.new))
    rng.shuffle(found)
    return found
