import collections
import heapq
import copy
import operator


class Item:
    def __init__(self, price=1.5):
        self.price = price
        self.tags = []

    def total(self):
        return self.price


d = {"a": Item(), "b": Item()}
r1 = d.get("a")
r2 = d.get("c", None)
r3 = d.get("c", 3)
r4 = d.pop("b")
d["b"] = Item()
r5 = d.pop("zz", None)
r6 = d.setdefault("q", Item())
r7 = d.items()
r8 = d.keys()
r9 = d.values()
r10 = d.copy()
r11 = d.popitem()
r12 = dict(d)
r13 = dict(a=1, b=2)
r14 = dict([("a", 1.0)])
r15 = dict.fromkeys(["a"], 0)
r16 = {**d, "z": Item()}
r17 = d | {"e": Item()}
print(r1, r2, r3, r4, r5, r6, r7, r8, r9, r10, r11, r12, r13, r14, r15, r16, r17)
for k, v in d.items():
    print(k, v, v.price)
for k in d:
    print(k, d[k].total())
for v in d.values():
    v.total()
x1 = next(iter(d))
x2 = next(iter(d.values()))
x3 = list(d)[0]
x4 = sorted(d.items())[0]
x5 = sorted(d.values(), key=lambda it: it.price)[0]
x6 = max(d.values(), key=lambda it: it.price)
x7 = min([3, 4])
x8 = sum([1, 2])
x9 = sum([1.0, 2.0])
print(x1, x2, x3, x4, x5, x6, x7, x8, x9)
x4[1].price
l = [Item(), Item()]
l.append(Item())
l2 = []
l2.append(Item())
l2[0]
y1 = l[0]
y2 = l[0:1]
y3 = l[-1]
y4 = l.pop()
y5 = l + [Item()]
y6 = l * 2
y7 = [*l, Item()]
y8 = l.index(y1)
y9 = l.copy()
y10 = list(reversed(l))
y11 = l2[0]
y12 = list(map(lambda i: i.price, l))
y13 = list(filter(None, l))
y14 = list(filter(lambda i: i.price > 1, l))
y15 = list(zip(l, [1, 2]))
y16 = list(enumerate(l))
y17 = [i.price for i in l]
y18 = {i.price for i in l}
y19 = {i.price: i for i in l}
y20 = tuple(l)
y21 = (1, "a", 2.0)
y22 = y21[1]
y23 = y21[1:]
y24 = y21 + (3,)
a, b, c = y21
first, *rest = l
h, *t = y21
print(
    y1,
    y2,
    y3,
    y4,
    y5,
    y6,
    y7,
    y8,
    y9,
    y10,
    y11,
    y12[0],
    y13[0],
    y14[0],
    y15[0],
    y16[0],
    y17[0],
    y18,
    y19,
    y20[0],
    y22,
    y23,
    y24,
)
print(a, b, c, first, rest, h, t, rest[0], t[0])
y15[0][0].price
y16[0][1].price
(p, q), s = (1, "x"), 2.5
print(p, q, s)
for i, (m, n) in enumerate([(1, "s")]):
    print(i, m, n)
for i, item in enumerate(l):
    print(i, item)
for g, hh in zip(l, "abc"):
    print(g, hh)
s1 = {1, 2}
s2 = s1 | {3}
s3 = s1 & {2}
s4 = s1.union({"a"})
s5 = s1.pop()
s6 = frozenset([1])
print(s1, s2, s3, s4, s5, s6)
dd = collections.defaultdict(list)
dd["a"].append(1)
dd["a"][0]
di = collections.defaultdict(int)
di["a"] += 1
di["a"]
df = collections.defaultdict(lambda: Item())
df["x"].price
dl = collections.defaultdict(lambda: [0, 0])
dl["x"]
cn = collections.Counter("abc")
cn["a"]
mc = cn.most_common(1)
mc[0][0]
mc[0][1]
od = collections.OrderedDict()
od["a"] = 1
od["a"]
od2 = collections.OrderedDict([("a", Item())])
od2["a"]
dq = collections.deque([Item()])
dq[0]
dq.popleft()
dq.append(Item())
dq.pop()
cm = collections.ChainMap({"a": 1}, {"b": 2})
cm["a"]
hq = [3, 1]
heapq.heapify(hq)
hp = heapq.heappop(hq)
hn = heapq.nlargest(1, [1, 2])
hn[0]
print(hp, hn)
cp = copy.copy(l)
cp2 = copy.deepcopy(Item())
cp2.price
print(cp, cp2)
ig = operator.itemgetter(1)
ag = operator.attrgetter("price")
print(ig, ag)
st = "a,b".split(",")
st[0]
pt = "a=b".partition("=")
pt[0]
j = ",".join(st)
e = "x".encode()
dec = e.decode()
f = "%s" % 3
fm = "{}".format(1)
bb = b"ab"[0]
bs = b"ab"[0:1]
sx = "abc"[0]
print(st, pt, j, e, dec, f, fm, bb, bs, sx)
mm = memoryview(b"x")
mm[0]
rg = range(3)
rg[0]
nest = {"a": {"b": [Item()]}}
nest["a"]["b"][0].price
ln = [[1, 2], [3]]
ln[0][0]
lt = [(1, "a")]
lt[0][1]
for u, w in lt:
    print(u, w)
dt = {("a", 1): Item()}
for (ka, kb), val in dt.items():
    print(ka, kb, val)
gr = {}
for it in l:
    gr.setdefault(it.price, []).append(it)
gr[1.5][0].price
for price, items in gr.items():
    print(price, items)
    for one in items:
        one.price
acc = []
for z in range(3):
    acc.append((z, Item()))
acc[0][1].price
acc[0][0]
acc2 = {}
acc2["k"] = Item()
acc2["k"].price
acc3 = {}
acc3.update({"a": Item()})
acc3["a"].price
acc4 = set()
acc4.add(Item())
for al in acc4:
    al.price
acc5 = []
acc5.extend([Item()])
acc5[0].price
acc6 = []
acc6 += [Item()]
acc6[0].price
acc7 = []
acc7.insert(0, Item())
acc7[0].price
acc8 = [None] * 3
acc8[0] = Item()
acc8[0]
acc9 = [0 for _ in range(3)]
acc9[0]
