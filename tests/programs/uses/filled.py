# Containers, and what is put into them.
import bisect
import heapq
from collections import Counter, defaultdict, deque
from heapq import heappush


class Item:
    size = 1


def lists():
    one = []
    one.append(Item())
    one[0].size
    two = []
    two.insert(0, Item())
    two.pop().size
    three = []
    three.extend([Item()])
    for item in three:
        item.size
    four = []
    four += [Item()]
    four[-1].size
    five = []
    five[0:0] = [Item()]
    five[0].size
    six = [[]]
    six[0].append(Item())
    six[0][0].size
    seven = list()
    heappush(seven, Item())
    seven[0].size
    eight = []
    heapq.heappush(eight, Item())
    bisect.insort(eight, Item())
    eight[0].size
    nine = [None] * 3
    nine[1] = Item()
    nine[1].size
    ten = [Item() for _ in range(3)]
    ten[0].size
    ten.copy()[0].size
    (one + two)[0].size
    (one or two)[0].size
    eleven, twelve = [], [Item()]
    eleven.append(twelve[0])
    eleven[0].size


def sets():
    one = set()
    one.add(Item())
    for item in one:
        item.size
    two = {Item()}
    next(iter(two)).size
    three = frozenset([Item()])
    for item in three:
        item.size
    four = deque()
    four.append(Item())
    four.appendleft("")
    four.popleft().size
    five = deque([Item()])
    five.extendleft([1])
    for item in five:
        item.size


def dictionaries():
    one = {}
    one["a"] = Item()
    one["a"].size
    one.get("a").size
    two = {}
    two.setdefault("a", Item()).size
    two["b"].size
    three = {}
    three.setdefault("a", []).append(Item())
    three["a"][0].size
    four = {}
    four.update(a=Item())
    four["a"].size
    five = {}
    five.update({"a": Item()}, **{"b": 1})
    five["b"]
    five["a"].size
    six = {}
    six["a"] = {}
    six["a"]["b"] = Item()
    six["a"]["b"].size
    seven = dict(a=Item(), b=1)
    seven["a"].size
    seven["b"].real
    eight = dict([("a", Item())])
    eight["a"].size
    nine = {"a": Item(), **seven}
    nine["b"]
    for key, value in nine.items():
        key.upper
        value.size
    for value in one.values():
        value.size
    ten = {}
    ten.__setitem__("a", Item())
    ten["a"].size
    eleven = {"n": 0}
    eleven["n"] += 1
    eleven["n"].real
    twelve = defaultdict(list)
    twelve["a"].append(Item())
    twelve["a"][0].size
    thirteen = defaultdict(lambda: Item())
    thirteen["a"].size
    fourteen = Counter()
    fourteen["a"] += 1
    fourteen["a"]
    fifteen = {"a": 1, "b": Item(), "c": [Item()], "d": {"e": Item()}}
    fifteen["a"].real
    fifteen["b"].size
    fifteen["c"][0].size
    fifteen["d"]["e"].size
    sixteen = {key: Item() for key in "ab"}
    sixteen["a"].size
    sixteen |= {"c": 1}
    sixteen["c"]


def tuples():
    one = (Item(), 1, "a")
    one[0].size
    one[-1].upper
    one[0:2][1].real
    first, *rest = one
    first.size
    rest[0].real
    (second, third), fourth = (Item(), 2), "c"
    second.size
    third.real
    fourth.upper
    two = one + (b"",)
    two[3].decode
    two[0].size
    for number, (left, right) in enumerate([(Item(), 1)]):
        number.real
        left.size
        right.real
    for left, right in zip([Item()], ["a"]):
        left.size
        right.upper
    three = tuple([Item()])
    three[0].size
    *four, five = [Item(), Item()]
    four[0].size
    five.size
    [six, seven] = Item(), ""
    six.size
    seven.upper


class Holder:
    shared = []

    def __init__(self):
        self.own = []
        self.by_name = {}
        self.later = None

    def put(self, item):
        self.own.append(item)
        self.by_name[item.size] = item
        self.shared.append(Item())
        self.later = Item()
        self.later.size

    def use(self):
        self.own[0].size
        self.by_name[1].size
        self.shared[0].size
        self.later.size
        for item in self.own:
            item.size
        if self.later is None:
            return None
        return self.later


Holder().put(Item())
Holder().use().size
Holder().own.pop().size
