"""What can be changed in a C++ source file, found in its text. There is no parser: what is no sense does not compile.

`find(text)` gives the functions and the mutations. Relies on the repository's formatting: an operator with two operands
stands between spaces, a template's bracket does not, and every controlled statement has braces.
"""

import re
from collections import namedtuple

# What stands between `start` and `end` becomes `new`; the label says what that is.
Mutation = namedtuple("Mutation", "start end new label")

TOKEN = re.compile(r"""(?P<skip>//[^\n]*|/\*.*?\*/|^[ ]*\#if.*?^[ ]*\#endif|^[ ]*\#(?:\\\n|[^\n])*)
    |(?P<text>(?:u8|u|U|L)?"(?:\\.|[^"\\\n])*"|(?:u8|u|U|L)?'(?:\\.|[^'\\\n])+')
    |(?P<number>\d(?:[\w.]|'\d)*)|(?P<word>[A-Za-z_]\w*)
    |(?P<mark>->|::|&&|\|\||<<|[-+*/%&|^=!<>]=|\+\+|--|[^\s\w])""", re.M | re.S | re.X)

TURNED = {"==": ["!="], "!=": ["=="], "<": ["<=", ">="], "<=": ["<", ">"], ">": [">=", "<="], ">=": [">", "<"],
          "&&": ["||"], "||": ["&&"], "+": ["-"], "-": ["+"], "+=": ["-="], "-=": ["+="], "*": ["/"]}
CONTROL = {"if", "for", "while", "else", "try", "catch", "do", "switch"}
NO_STATEMENT = {"using", "static_assert", "case", "default", "namespace", "struct", "class"}
NO_CALL = CONTROL | {"return", "throw", "static_cast", "move", "forward", "sizeof", "offsetof", "decltype", "noexcept"}
DECLARATION = re.compile(r"(?:(?:const|static|constexpr) )*[A-Za-z_][\w:]*(?:<[^;]*?>)?(?:::\w+)*[&*]*(?: const)?"
                         r" [&*]*(?:\[[\w, ]+\]|[A-Za-z_]\w*)(?: =|;|\(|\{)")


class Source:
    def __init__(self, text):
        self.text = text
        self.tokens = [match for match in TOKEN.finditer(text) if match.lastgroup != "skip"]
        self.words = [match.group() for match in self.tokens]
        self.partner = {}
        opened = []
        for i, word in enumerate(self.words):
            if word in ("(", "[", "{"):
                opened.append(i)
            elif word in (")", "]", "}"):
                self.partner[i] = opened.pop()
                self.partner[self.partner[i]] = i
        self.functions = []  # (index of the opening brace, whether its mutants can be chosen while it runs)
        self.silent = []     # stretches of text that are left alone
        self._find_functions()

    def start(self, i):
        return self.tokens[i].start()

    def end(self, i):
        return self.tokens[i].end()

    def slice(self, first, last):
        """The text from one token to another, both with it."""
        return self.text[self.start(first):self.end(last)]

    def top(self, first, last):
        """The indices from one token to another that are in no bracket among them."""
        i = first
        while i <= last:
            yield i
            i = self.partner[i] if self.words[i] in ("(", "[", "{") else i
            i += 1

    def _find_functions(self):
        i, head = 0, []
        while i < len(self.words):
            word = self.words[i]
            if word == "static_assert":
                self.silent.append((self.start(i), self.end(self.partner[i + 1])))
            if word in (";", "}") or word == ":" and head[-1:] in (["public"], ["private"], ["protected"]):
                head = []
            elif word == "{" and (not head or "namespace" in head or head[0] == "extern" and len(head) == 2 or
                                  "(" not in head and {"class", "struct"} & set(head) and head[0] != "enum"):
                head = []
            elif word == "{" and "(" in head and "=" not in head and not (":" in head and re.match(r"\w", head[-1])):
                self.functions.append((i, "constexpr" not in head))
                if "noexcept" in head:
                    self.silent.append((self.start(i), self.end(self.partner[i])))
                i, head = self.partner[i], []
            else:
                head.append(word)
                i = self.partner[i] if word in ("(", "[", "{") else i
            i += 1

    def statements(self, opening):
        """The simple statements in a function, lambdas' too, as [(first, last, block)]: token indices, the brace's."""
        found, stack, first = [], [], opening + 1
        for i in range(opening + 1, self.partner[opening]):
            word = self.words[i]
            inner = self.words[stack[-1][0]] if stack else "{"
            if word in ("(", "[", "{"):
                controls = word == "{" and inner == "{" and (first == i or self.words[first] in CONTROL)
                stack.append((i, first, controls))
                first = i + 1
            elif word in (")", "]", "}"):
                _, before, controlled = stack.pop()
                first = i + 1 if controlled else before
            elif word == ";" and inner == "{":
                found.append((first, i, stack[-1][0] if stack else opening))
                first = i + 1
            elif word == ":" and inner == "{" and self.words[first] in ("case", "default", "public", "private"):
                first = i + 1
        return found


def _of_statements(source, opening):
    ends_simply = source.words[source.partner[opening] - 1] == ";"
    previous = None
    for first, last, block in source.statements(opening):
        head, text = source.words[first], source.slice(first, last)
        declares = head not in ("return", "throw", "break", "continue", "delete") and DECLARATION.match(text)
        # No function may end without its result.
        needed = head == "return" and last > first + 1 and (
            not ends_simply or block == opening or source.words[source.partner[block] + 1] in (")", ",", ";"))
        if head not in NO_STATEMENT and not needed:
            yield Mutation(source.start(first), source.end(last), ";", "drop")
        simple = head not in NO_STATEMENT | {"return", "throw", "break", "continue"}
        if previous and simple and previous[2] == block and previous[1] == first - 1 and not (declares and previous[3]):
            before = source.slice(previous[0], previous[1])
            between = source.text[source.end(previous[1]):source.start(first)]
            yield Mutation(source.start(previous[0]), source.end(last), text + between + before, "swap with the next")
        previous = (first, last, block, declares) if simple else None


def _negated(source, first, last, label):
    """The condition between two tokens turned round, unless turning its one operator does the same."""
    words = [source.words[i] for i in source.top(first, last)]
    if not {"&&", "||", "?"} & set(words) and (words[0] == "!" or {"==", "!=", "<", "<=", ">", ">="} & {
            word for word in words if f" {word} " in source.slice(first, last)}):
        return
    text = source.slice(first, last)
    declared = re.match(r".*?[\s*&](\w+) = ", text, re.S) if "=" in words else None
    yield Mutation(source.start(first), source.end(last),
                   f"{text}; !({declared.group(1)})" if declared else f"!({text})", label)


def _of_conditions(source, i):
    word = source.words[i]
    if word in ("if", "while") and source.words[i + 1] == "(":
        first = max([i + 2] + [k + 1 for k in source.top(i + 2, source.partner[i + 1] - 1) if source.words[k] == ";"])
        yield from _negated(source, first, source.partner[i + 1] - 1, "negate")
    elif word == "return" and source.words[i + 1] not in (";", "{", "true", "false", "nullptr"):
        last = next(k for k in source.top(i + 1, len(source.words)) if source.words[k] == ";") - 1
        if source.slice(i + 1, last) != "std::nullopt" and "?" not in source.words[i + 1:last]:
            yield from _negated(source, i + 1, last, "negate")
    elif word == "?":
        first = i
        while source.words[first - 1] not in ("=", "(", ",", ";", "{", "}", "return", "?", ":", "[", "<<"):
            first = source.partner.get(first - 1, first - 1)
        yield from _negated(source, first, i - 1, "negate")


def _of_calls(source, i):
    """A method's call makes way for its object, a function's for its only argument."""
    if source.tokens[i].lastgroup != "word" or source.words[i + 1] != "(" or source.words[i] in NO_CALL or (
            source.words[i].startswith("WL_LOG")):
        return
    close, before = source.partner[i + 1], source.words[i - 1]
    label = f"leave out {source.words[i]}"
    first = i
    while source.words[first - 1] in (".", "->", "::"):
        first = source.partner.get(first - 2, first - 2)
        first -= source.words[first] in ("(", "[")
    if source.words[close + 1] == ";" and source.words[first - 1] in (";", "{", "}"):
        return  # dropped as a statement
    if before in (".", "->"):
        yield Mutation(source.start(i - 1), source.end(close), "", label)
        return
    before, name = source.words[first - 1], source.words[first]
    if name == "std" or before in (".", "->", ">", "]") or re.match(r"[A-Z](?!L)", source.words[i]) or re.match(
            r"\w", before) and before not in ("return", "else"):
        return
    if close > i + 2 and "," not in [source.words[k] for k in source.top(i + 2, close - 1)]:
        yield Mutation(source.start(first), source.end(close), source.slice(i + 2, close - 1), label)


def _of_token(source, i):
    token, word = source.tokens[i], source.words[i]
    spaced = source.text[token.start() - 1:token.end() + 1].isspace() or re.fullmatch(
        r"\s\S+\s", source.text[token.start() - 1:token.end() + 1])
    news = []
    if token.lastgroup == "number":
        number = re.match(r"[\d']+", word).group()
        is_octal = re.match(r"0\d", number)
        value = int(number.replace("'", ""), 8 if is_octal else 10)
        news = [("0" + format(each, "o") if is_octal else str(each)) + word[len(number):]
                for each in (value + 1, value - 1) if each >= 0]
    elif word in ("true", "false"):
        news = ["false" if word == "true" else "true"]
    elif word in TURNED and spaced:
        news = TURNED[word]
    elif word in ("++", "--"):
        news = ["--" if word == "++" else "++"]
    elif word == "!":
        news = [""]
    for new in news:
        yield Mutation(token.start(), token.end(), new, f"{word} -> {new or 'nothing'}")


def find(text):
    """The source, and its mutations in order as (mutation, index of the function's opening brace or None)."""
    source = Source(text)
    found = {}
    for opening, chosen in source.functions:
        for mutation in _of_statements(source, opening):
            found[mutation] = None
    for i in range(1, len(source.words) - 1):
        for operation in (_of_conditions, _of_calls, _of_token):
            for mutation in operation(source, i):
                found[mutation] = None
    placed = []
    for mutation in sorted(found):
        if any(first <= mutation.start and mutation.end <= last for first, last in source.silent):
            continue
        inside = [opening for opening, chosen in source.functions
                  if chosen and source.start(opening) < mutation.start < source.end(source.partner[opening])]
        if inside or not mutation.label.startswith("leave out"):  # outside, members are initialised as if by a call
            placed.append((mutation, inside[0] if inside else None))
    return source, placed
