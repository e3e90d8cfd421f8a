"""What displays, operators, subscripts and builtins give."""
from heapq import heappush
from bisect import insort


class Thing:
    __match_args__ = ("first", "second")
    first, second = 1, "two"
    def __pos__(self): return "plus"
    def __lt__(self, other): return [other]
    def __mul__(self, other): return Other()
    def __truediv__(self, other): return 1.0
    def __class_getitem__(cls, key): return [cls, key]
    def __getitem__(self, key): return key
    def __setitem__(self, key, value): self.set = value
    def __delitem__(self, key): pass
    def __len__(self): return 1
class Other:
    def __rmul__(self, other): return other
    def __radd__(self, other): return self
    def __and__(self, other: int) -> "Thing": ...
    def __getattr__(self, name): return Thing()


thing, other = Thing(), Other()
operated = +thing, thing < 1, thing * 2, 2 * other, 1 + other, other & 1, thing / 2, -thing, 1 < 2, not 1, 1 in [1], 3 // 2, 7 % 2, 2 ** 3, 2 ** -1, "a" * 2, "a" % 1, [1] + ["a"], [1] * 2, 1 | 2, ~1, 1 + 1.5, 1.5 * 2, 1j, "a" "b", b"a" rb"b", (1,) + ("a",), thing or other, thing and other, thing if other else 1
subscripts = Thing[1], Thing[1, 2], thing["k"], thing[1:2], "abc"[0], b"abc"[0], b"abc"[0:1], (1, "a")[0], (1, "a")[-1], (1, "a")[0:1], (1, "a")[5], [1, "a"][0], {"a": 1}["a"], {"a": 1, 2: "b"}[2], {1: {2: 3}}[1][2], range(3)[0]
starred = [*"ab", *[1], 2], (*(1, "a"), 2.0), {*(1, 2), "x"}, {**{"a": 1}, "b": "c"}, (*[1], *thing)
entries = {"name": "x", "size": 3, "inner": {"deep": thing}}
entries["later"] = other
got = entries["name"], entries["size"], entries["inner"]["deep"].first, entries.get("size"), entries["later"], entries.get("none", 1), entries["no"]
as_dict = dict(a=1, b="x"), dict({"a": 1}, b="x")["b"], dict(**entries)["name"], dict(entries, size="y")["size"], dict([("a", 1)]), dict()
as_tuple = tuple((1, "a")), tuple([1]), tuple("ab"), list((1, "a")), set("a"), frozenset([1]), list(entries), sorted({"a": 1}), list(map(str, [1])), list(zip([1], "a")), list(enumerate("a")), iter([1]), next(iter([thing])), max([1, 2]), max(1, "a"), min, sum([1]), reversed([1]), abs(1), len(thing), getattr(thing, "first"), getattr(thing, "none", 1), hasattr, callable, isinstance(thing, Thing), type(thing).first, super, open, print, input()
empty_list, empty_dict, empty_set = [], {}, set()
empty_list.append(thing); empty_list.extend([1]); empty_list += ["a"]; empty_list.insert(0, 2.0); empty_list[0] = b""; empty_list[1:2] = [other]; heappush(empty_list, None); insort(empty_list, 3j)
empty_dict["a"] = thing; empty_dict.update({"b": 1}); empty_dict.update(c="x"); empty_dict.setdefault("d", []).append(2.0); empty_dict.setdefault("e"); empty_dict.__setitem__("f", other); empty_dict |= {"g": b""}; empty_dict.update([("h", 1)])
empty_set.add(1); empty_set.update(["a"], {2.0}); empty_set |= {thing}; empty_set.discard(None)
nested = {}
nested.setdefault("a", {}).setdefault("b", []).append(thing); nested["x"]["y"] = 1; nested["a"]["b"][0].first
lists = [[] for _ in range(3)]; lists[0].append(1)
self_list = []; self_list.append(self_list); self_list[0][0]
class Holder:
    items, table = [], {}
    def __init__(self): self.own = []; self.by = {}; self.queue = list()
    def put(self, x): self.items.append(x); self.own.append(1); self.by[x] = "v"; self.table[x] = self; self.queue.insert(0, Thing())
    def get(self): return self.items[0], self.own[0], self.by["k"], self.table[1], self.queue.pop()
h = Holder(); h.put("s"); h.own.append("later"); h.get()
(a, b), [c, *d], *e = (1, "a"), [2, "b", 3.0], 4, "c"
first, *middle, last = [1, "a", 2.0, b""]
*start, end = (1, "a"); x, y = y, x = 1, "a"; (p), = [thing]; q, r = thing; s, t = "ab"; u, v = {"k": 1}; w, z, k = entries.items()
for i, (key, value) in enumerate(entries.items()): pair = key, value
for n, o in [(1, "a"), (2, None)]: pass
for (f, *g), l in [((1, "a"), 2)]: pass
match thing:
    case Thing(1, second=sec): sec
    case Thing(fst, snd) as whole: fst, snd, whole
    case [Thing(first=ff), *others]: ff, others
    case {"k": Thing() as inner, **rest}: inner, rest
    case str() | int() as either: either
    case Other(anything=any_): any_
    case (1 | 2) as num: num
match entries, 1:
    case {"name": nm, "size": sz}, one: nm, sz, one
lambdas = (lambda x: x)(1), (lambda *a, k=1, **kw: (a, k, kw))(1, 2, z=3), (lambda: (yield))(), [f for f in (lambda: 1, lambda: "a")][0]()
comp = [x * 2 for x in [1]], {k: v for k, v in entries.items()}, {x for x in "a"}, (x for x in (1, "a")), [y for x in [[1]] for y in x], [z for z in thing if z], {**{k: [k] for k in "a"}}
def gen():
    got = yield 1
    more = yield from [2, "a"]
    yield got, more
    return "done"
def delegating(): result = yield from gen(); yield result
def ordered():
    yield 1
    yield "a"
    yield thing
one, text, third = ordered()
for each in gen(): each
g = gen(); g.send(1); next(g); g.close(); list(gen()); dict(ordered()); [*gen()]
def recursive(n): return n and recursive(n - 1) or thing
def even(n): return True if n == 0 else odd(n - 1)
def odd(n): return "" if n == 0 else even(n - 1)
def grows(x): return grows([x]) if x else x
def swap(x, y): return swap(y, x) if x else (x, y)
recursion = recursive(1), even(1), odd("a"), grows(1), swap(1, "a")
i = 0
while i: i = i + 1.5 if i else str(i)
acc = None
for part in [1, "a"]: acc = (acc, part)
del thing.first, entries["name"], a, (b, c)
t"{thing}", f"{thing}", __name__, __file__, ..., None, True, NotImplemented, Ellipsis, __debug__
