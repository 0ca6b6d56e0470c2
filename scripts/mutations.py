# SPDX-License-Identifier: Apache-2.0
"""Small changes of C++ sources that good tests notice: of one operator, of one constant, of the order of two statements.

Sources are read in the form that clang-format gives them: blanks on both sides tell an operator between two operands from
a sign, a pointer or a template's bracket, and a short statement has a line of its own. Comments, texts, directives and
what is only traced are left alone.
"""

import random
import re
from typing import NamedTuple

TOKEN = re.compile(
    r"""(?P<space> \s+ )
      | (?P<comment> //[^\n]* | /\*.*?\*/ )
      | (?P<directive> \#(?:\\\n|[^\n])* )
      | (?P<raw> (?:u8|[uUL])?R"(?P<fence>[^()\\\s]*)\(.*?\)(?P=fence)" )
      | (?P<string> (?:u8|[uUL])?"(?:\\.|[^"\\\n])*" )
      | (?P<character> (?:u8|[uUL])?'(?:\\.|[^'\\\n])+' )
      | (?P<name> [A-Za-z_]\w* )
      | (?P<number> \.?\d(?:[eEpP][+-]|['\w.])* )
      | (?P<mark> <<=|>>=|<=>|->\*|\.\.\.|[-+*/%&|^<>=!]=|&&|\|\||<<|>>|\+\+|--|->|::|\S )""",
    re.VERBOSE | re.DOTALL)

BETWEEN_OPERANDS = {
    "<": ["<=", ">="], "<=": ["<", ">"], ">": [">=", "<="], ">=": [">", "<"], "==": ["!="], "!=": ["=="],
    "&&": ["||"], "||": ["&&"], "&": ["|"], "|": ["&"], "^": ["&"], "<<": [">>"], ">>": ["<<"],
    "+": ["-"], "-": ["+"], "*": ["/"], "/": ["*"], "%": ["*"],
    "+=": ["-="], "-=": ["+="], "*=": ["/="], "/=": ["*="], "|=": ["&="], "&=": ["|="], "<<=": [">>="], ">>=": ["<<="],
}
OF_ONE_OPERAND = {"!": [""], "++": ["--"], "--": ["++"]}
WORDS = {"true": ["false"], "false": ["true"]}

SILENT_CALL = re.compile(r"CmTrace\w*|Trace[A-Z]\w*|static_assert")
NUMBER = re.compile(r"(0[xX][\da-fA-F']+|(?!0[bB])[\d'.]+(?:[eE][+-]?\d+)?)([a-zA-Z_]\w*)?")
NO_PLAIN_STATEMENT = {
    "break", "case", "catch", "constexpr", "continue", "default", "do", "else", "for", "friend", "goto", "if", "private",
    "protected", "public", "return", "switch", "template", "throw", "try", "typedef", "using", "while"}
HOLDS_DECLARATIONS = {"class", "enum", "extern", "namespace", "struct", "union"}
DECLARATION = re.compile(
    r"(?:const|static|auto)\b|(?:unsigned |long )*[\w:]+(?:<.*>)?(?: const)?[&*]*(?: const)? \w+(?:\[.*\])?(?: =|[({;])")
ASSIGNMENTS = {"=", "+=", "-=", "*=", "/=", "%=", "|=", "&=", "^=", "<<=", ">>="}
KEYWORDS = {"auto", "bool", "char", "const", "delete", "double", "float", "int", "long", "new", "static", "this", "unsigned",
            "void"}


class Token(NamedTuple):
    kind: str
    text: str
    begin: int

    @property
    def end(self):
        return self.begin + len(self.text)


class Mutation(NamedTuple):
    kind: str
    line: int
    column: int
    begin: int
    old: str
    new: str


def read_tokens(text):
    """All of the code: no blanks, comments or directives."""
    return [Token(match.lastgroup, match.group(), match.start()) for match in TOKEN.finditer(text)
            if match.lastgroup not in ("space", "comment", "directive")]


def closing(tokens, at, opens, closes):
    """Where the bracket at `at` is closed; the last token if nowhere."""
    depth = 0
    for index in range(at, len(tokens)):
        depth += tokens[index].text.count(opens) if tokens[index].kind == "mark" else 0
        depth -= tokens[index].text.count(closes) if tokens[index].kind == "mark" else 0
        if depth == 0:
            return index
    return len(tokens) - 1


def silent_tokens(tokens):
    """The indices of what tests cannot hear of: traces, templates' parameters, names of operators."""
    silent = set()
    for index, token in enumerate(tokens[:-1]):
        following = tokens[index + 1].text
        last = index
        if SILENT_CALL.fullmatch(token.text) and following == "(":
            last = closing(tokens, index + 1, "(", ")")
        elif token.text == "template" and following == "<":
            last = closing(tokens, index + 1, "<", ">")
        elif token.text == "operator":
            last = index + 1
        if last > index:
            silent.update(range(index, last + 1))
    return silent


# ---- Operators and constants


def other_numbers(text):
    match = NUMBER.fullmatch(text)
    if match is None:
        return []
    digits, suffix = match.group(1).replace("'", ""), match.group(2) or ""
    if re.fullmatch(r"0[xX].*", digits):
        value, form = int(digits, 16), hex
    elif re.fullmatch(r"0[0-7]+", digits):
        value, form = int(digits, 8), "0{:o}".format
    elif digits.isdigit():
        value, form = int(digits), str
    else:
        value = float(digits)
        return [repr(value * 2 if value else 1.0) + suffix]
    return [form(other) + suffix for other in (value + 1, value - 1) if other >= 0]


def replacements(text, tokens, index):
    """What kind of thing a token is, and what may stand in its place."""
    token = tokens[index]
    if token.kind == "number":
        return "constant", other_numbers(token.text)
    if token.kind == "name":
        return "constant", WORDS.get(token.text, [])
    if token.kind != "mark":
        return "", []
    if token.text in OF_ONE_OPERAND:
        return "operator", OF_ONE_OPERAND[token.text]
    between = text[token.begin - 1].isspace() and text[token.end:token.end + 1].isspace()
    joins_texts = token.text in ("+", "<<", "+=") and any(
        neighbour.kind == "string" for neighbour in tokens[max(index - 1, 0):index + 2])
    return "operator", BETWEEN_OPERANDS.get(token.text, []) if between and not joins_texts else []


# ---- Order


def inside_functions(tokens):
    """For each token, whether statements stand there, and not declarations of a namespace or a class."""
    inside, open_blocks, head = [], [], 0
    for index, token in enumerate(tokens):
        inside.append(bool(open_blocks) and open_blocks[-1])
        if token.kind != "mark" or token.text not in "{};":
            continue
        if token.text == "{":
            start = head
            if tokens[start].text == "template":
                start = closing(tokens, start + 1, "<", ">") + 1
            has_parameters = any(each.text == ")" for each in tokens[start:index])
            open_blocks.append(has_parameters or tokens[start].text not in HOLDS_DECLARATIONS)
        elif token.text == "}" and open_blocks:
            open_blocks.pop()
        head = index + 1
    return inside


def plain_statements(text, tokens, silent):
    """Statements that have a line of their own and no other under them: line number to (first, last) index."""
    inside = inside_functions(tokens)
    lines = {}
    for index, token in enumerate(tokens):
        lines.setdefault(text.count("\n", 0, token.begin), []).append(index)
    found = {}
    for line, indices in lines.items():
        first, last = indices[0], indices[-1]
        marks = [tokens[index].text for index in indices if tokens[index].kind == "mark"]
        balanced = all(marks.count(opens) == marks.count(closes) for opens, closes in ("()", "[]", "{}"))
        if (tokens[last].text == ";" and marks.count(";") == 1 and balanced and inside[first] and first > 0 and
                tokens[first].kind == "name" and tokens[first].text not in NO_PLAIN_STATEMENT and first not in silent and
                tokens[first - 1].text in ("{", "}", ";")):
            found[line] = (first, last)
    return found


def names(tokens):
    return {token.text for token in tokens if token.kind == "name"} - KEYWORDS


def calls(tokens):
    return any(token.text == "(" for token in tokens)


def declared_names(text, statement):
    if DECLARATION.match(text[statement[0].begin:statement[-1].end]) is None:
        return set()
    end = next(index for index, token in enumerate(statement) if token.text in ("=", "(", "{", ";"))
    begin = next((index for index, token in enumerate(statement[:end]) if token.text == "["), None)
    if begin is not None:
        return names(statement[begin:end])
    return {[token.text for token in statement[:end] if token.kind == "name"][-1]}


def assigned(statement):
    """What stands before the sign of an assignment."""
    texts = [token.text for token in statement]
    sign = next((at for at, each in enumerate(texts) if each in ASSIGNMENTS), 0)
    return texts[:sign]


def mentions(statement, what):
    texts = [token.text for token in statement]
    return any(texts[at:at + len(what)] == what for at in range(len(texts)))


def makes_a_difference(text, first, second):
    """Whether the order of two statements (lists of tokens) can matter, and the other one has a chance to compile."""
    declared = declared_names(text, first)
    if declared and (declared_names(text, second) or declared & names(second)):
        return False
    if not declared and assigned(first) and assigned(second) and not (calls(first) and calls(second)):
        return mentions(second, assigned(first)) or mentions(first, assigned(second))
    if names(first) & names(second):
        return True
    return calls(first) and calls(second) if declared else calls(first) or calls(second)


def orders(text, tokens, silent):
    statements = plain_statements(text, tokens, silent)
    for line, (first, last) in statements.items():
        after_first, after_last = statements.get(line + 1, (0, 0))
        if after_first != last + 1:
            continue
        above, below = tokens[first:last + 1], tokens[after_first:after_last + 1]
        begin, end = above[0].begin, below[-1].end
        upper, between, lower = text[begin:above[-1].end], text[above[-1].end:below[0].begin], text[below[0].begin:end]
        if upper != lower and makes_a_difference(text, above, below):
            yield "order", begin, upper + between + lower, lower + between + upper


# ---- All together


def mutations(text):
    """Every change of the text, each of one place, in the order of their places."""
    tokens = read_tokens(text)
    silent = silent_tokens(tokens)
    found = list(orders(text, tokens, silent))
    for index, token in enumerate(tokens):
        if index not in silent:
            kind, others = replacements(text, tokens, index)
            found += [(kind, token.begin, token.text, other) for other in others]
    return [Mutation(kind, text.count("\n", 0, begin) + 1, begin - text.rfind("\n", 0, begin), begin, old, new)
            for kind, begin, old, new in sorted(found, key=lambda each: each[1])]


def mutated(text, mutation):
    end = mutation.begin + len(mutation.old)
    if text[mutation.begin:end] != mutation.old:
        raise ValueError(f"line {mutation.line} is not the one that was to be changed")
    return text[:mutation.begin] + mutation.new + text[end:]


def drawn(choices, seed):
    """Each of (file, mutation) once, by chance: a line first, any as likely as another, then a change of it."""
    lines = {}
    for path, mutation in choices:
        lines.setdefault((path, mutation.line), []).append((path, mutation))
    lines = list(lines.values())
    chance = random.Random(seed)
    while lines:
        line = chance.randrange(len(lines))
        yield lines[line].pop(chance.randrange(len(lines[line])))
        if not lines[line]:
            lines.pop(line)
