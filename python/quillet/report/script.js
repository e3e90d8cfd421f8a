// What a page does beyond its links: the places of a name that is clicked, what is known of the name under
// the pointer, and the search. Data are scripts that call `quillet.take`, since a page that is opened from
// disk may load nothing else; text is only ever set as text.
"use strict";
const quillet = {
  take: (...values) => { document.currentScript.taken = values; },
};
(() => {
  const { up, file: ownFile, scripts } = document.currentScript.dataset;
  const FILE = ownFile === undefined ? -1 : Number(ownFile);

  const asked = new Map();
  // What the script of this name hands over, or null where it cannot be loaded. Loaded once.
  const load = (name) => {
    if (!asked.has(name)) {
      asked.set(name, new Promise((done) => {
        const script = document.createElement("script");
        script.src = `${up}${name}.js`;
        script.onload = () => { done(script.taken); script.remove(); };
        script.onerror = () => done(null);
        document.head.append(script);
      }));
    }
    return asked.get(name);
  };
  const element = (tag, attributes = {}, ...content) => {
    const made = document.createElement(tag);
    for (const [key, value] of Object.entries(attributes)) made.setAttribute(key, value);
    made.append(...content);
    return made;
  };
  const addressOf = (file, line) => `${file === FILE ? "" : `${up}files/${file}.html`}#L${line}`;
  const counted = (count, word) => `${count.toLocaleString("en")} ${word}${count === 1 ? "" : "s"}`;

  // ---- the names of a page ----

  // Roles in the order of their numbers in the data, with the letter of a link's class and the title of their
  // places. The kind of a definition stands above the bit that says that a name is an attribute.
  const ROLES = [
    ["d", "Definitions"], ["w", "Assignments"], ["r", "Reads"], ["c", "Calls"],
    ["x", "Deletions"], ["i", "Imports"], ["k", "Keyword arguments"], ["g", "Declarations"],
    ["param", "Parameters"],
  ];
  const KINDS = ["", "class", "def", "parameter", "variable", "type parameter", "type", "import"];
  const ATTRIBUTE = 8;
  const DEFINITION = 0;
  const KEYWORD = 6;
  const PARAMETER = 8;
  const SHOWN = [0, 3, 2, 1, 5, 4, 7];
  // Keyword arguments mean parameters, and nothing else does.
  const SHOWN_OF_PARAMETERS = [PARAMETER, KEYWORD];
  const roleOfCode = (code) => (code === 3 << 4 ? PARAMETER : code & 7);

  const lineOf = (link) => Number(link.closest("p").id.slice(1));
  const textOfLine = (row) => [...row.childNodes].slice(1).map((node) => node.textContent).join("").trim();
  const linksOf = (link) => {
    const { s, n } = link.dataset;
    return [...document.querySelectorAll(s !== undefined ? `a[data-s="${s}"]` : `a[data-n="${n}"]`)];
  };
  const isName = (link) => link.dataset.s !== undefined || link.dataset.n !== undefined;
  const nameAt = (event) => {
    const link = event.target.closest?.("main.source a");
    return link && isName(link) ? link : null;
  };

  // ---- the panel of places ----

  const MOST_ROWS = 60;
  let panel = null;
  let opener = null;
  const closePanel = () => {
    if (!panel || panel.hidden) return false;
    panel.hidden = true;
    document.body.classList.remove("open");
    document.querySelectorAll("main.source .on").forEach((link) => link.classList.remove("on"));
    return true;
  };
  // Source lines of other files come when their rows come into view.
  const seen = new IntersectionObserver((entries) => {
    for (const { isIntersecting, target } of entries) {
      if (!isIntersecting) continue;
      seen.unobserve(target);
      load(`files/${target.dataset.file}`).then((taken) => {
        const text = taken?.[0][Number(target.dataset.line) - 1];
        if (text !== undefined) fill(target, text);
      });
    }
  }, { rootMargin: "200px" });
  const fill = (row, text) => {
    const { name } = row.dataset;
    const code = row.querySelector("code");
    const whole = new RegExp(`(?<![\\p{L}\\p{N}_])${name.replace(/[^\p{L}\p{N}_]/gu, "\\$&")}(?![\\p{L}\\p{N}_])`, "u");
    const pieces = text.split(whole);
    code.replaceChildren(pieces[0]);
    for (const piece of pieces.slice(1)) code.append(element("mark", {}, name), piece);
  };
  const rowOf = (name, { file, line, note }) => {
    const row = element("a", { href: addressOf(file, line) }, element("i", {}, String(line)), element("code"));
    Object.assign(row.dataset, { file, line, name });
    if (note) row.append(element("small", {}, note));
    const own = file === FILE ? document.getElementById(`L${line}`) : null;
    if (own) fill(row, textOfLine(own));
    else if (file !== FILE) seen.observe(row);
    return row;
  };
  // A titled list of places, by file; what is beyond the first ones is made when it is wanted.
  const sectionOf = (title, name, places, total, files) => {
    const list = element("div", { class: "places" });
    const section = element("section", {}, element("h3", {}, title, element("small", {}, total.toLocaleString("en"))), list);
    const add = (from, to) => {
      let last = from > 0 ? places[from - 1].file : null;
      for (const place of places.slice(from, to)) {
        if (files && place.file !== last) list.append(element("h4", {}, element("bdi", {}, files[place.file])));
        last = place.file;
        list.append(rowOf(name, place));
      }
    };
    add(0, MOST_ROWS);
    const isCut = total > places.length;
    if (places.length > MOST_ROWS) {
      const more = element("button", { type: "button" }, `Show ${counted(places.length - MOST_ROWS, "more place")}`);
      more.onclick = () => { more.remove(); add(MOST_ROWS); };
      section.append(more);
    }
    if (isCut) section.append(element("p", {}, `${counted(total - places.length, "more place")} not listed.`));
    return section;
  };
  const noteOf = (code, scope) => {
    if (scope) return scope;
    const kind = code & ATTRIBUTE && code >> 4 ? "attribute" : KINDS[code >> 4];
    return kind === "import" ? "" : kind;
  };
  const roleOfLink = (link) => ROLES.findIndex(([letter]) => link.classList.contains(letter));
  const inThisFile = (name, links) => {
    const places = links.map((link) => {
      const role = roleOfLink(link);
      const kind = role === DEFINITION ? ["class", "def", "param", "type"].find((word) => link.classList.contains(word)) : null;
      return { file: FILE, line: lineOf(link), note: kind || ROLES[role][1].toLowerCase().replace(/s$/, "") };
    });
    return sectionOf("In this file", name, places, places.length, null);
  };
  const elsewhere = ([name, counts, scopes, groups], files, isExact, roles) => {
    const scopeAt = new Map();
    for (let i = 0; i < scopes.length; i += 3) scopeAt.set(`${scopes[i]}:${scopes[i + 1]}`, scopes[i + 2]);
    const byRole = ROLES.map(() => []);
    const gone = ROLES.map(() => 0);
    for (const [file, ...numbers] of groups) {
      for (let i = 0; i < numbers.length; i += 3) {
        const [line, , code] = numbers.slice(i, i + 3);
        const role = roleOfCode(code);
        // What the page itself knows for sure stands above.
        if (isExact && file === FILE && !(code & ATTRIBUTE) && role !== KEYWORD) gone[role] += 1;
        else byRole[role].push({ file, line, code, note: noteOf(code, role === DEFINITION && scopeAt.get(`${file}:${line}`)) });
      }
    }
    return roles.filter((role) => byRole[role].length).map((role) =>
      sectionOf(ROLES[role][1], name, byRole[role], counts[role] - gone[role], files));
  };

  let latest = 0;
  const show = async (number, link) => {
    const turn = ++latest;
    const isParameter = link !== null && (link.classList.contains("k") || link.classList.contains("param"));
    const isLocal = link !== null && link.dataset.s !== undefined;
    const links = link ? linksOf(link) : [...document.querySelectorAll(`a[data-n="${number}"]`)];
    const [taken, paths] = number === null ? [null, null] : await Promise.all([load(`data/${number % scripts}`), load("data/files")]);
    if (turn !== latest) return;
    const entry = taken?.[0][number] ?? [link?.textContent ?? "", [], [], []];
    const [name] = entry;
    if (!panel) {
      panel = element("aside", { id: "panel", "aria-label": "Places of a name", tabindex: "-1" });
      document.body.append(panel);
    }
    closePanel();
    for (const same of links) same.classList.add("on");
    const close = element("button", { type: "button", class: "close", "aria-label": "Close" }, "✕");
    close.onclick = () => { closePanel(); opener?.focus({ preventScroll: true }); };
    panel.replaceChildren(element("div", { class: "title" }, element("h2", {}, name), close));
    if (link && !link.classList.contains("d")) {
      const [page, line] = link.getAttribute("href").split("#L");
      if (page || Number(line) !== lineOf(link)) {
        const what = line === undefined ? "Go to the module" : "Go to the definition";
        panel.append(element("p", { class: "go" }, element("a", { href: link.getAttribute("href") }, what),
          element("small", {}, page && line !== undefined ? "by its name" : "")));
      }
    }
    if (isLocal) panel.append(inThisFile(name, links));
    if (number !== null) {
      const sections = elsewhere(entry, paths?.[0] ?? [], isLocal, isParameter ? SHOWN_OF_PARAMETERS : SHOWN);
      if (sections.length) {
        panel.append(element("p", { class: "note" }, isLocal
          ? "Elsewhere, by name: spelled the same. Which of these mean this one is known only when the program runs."
          : "By name: all that are spelled like this. Which of them are meant here is known only when the program runs."));
        panel.append(...sections);
      }
    }
    panel.hidden = false;
    panel.scrollTop = 0;
    document.body.classList.add("open");
  };
  document.addEventListener("click", (event) => {
    const link = nameAt(event);
    if (!link || event.ctrlKey || event.metaKey || event.shiftKey || event.altKey || event.button) return;
    event.preventDefault();
    hideTip();
    opener = link;
    const byKey = event.detail === 0;
    show(link.dataset.n === undefined ? null : Number(link.dataset.n), link).then(() => {
      if (byKey) panel.focus({ preventScroll: true });
    });
  });
  document.addEventListener("dblclick", (event) => {
    const link = nameAt(event);
    if (link) location.href = link.href;
  });

  // ---- what is known of a name ----

  const MOST_FACTS = 4;
  let tip = null;
  const hideTip = () => { if (tip) tip.hidden = true; };
  const factsOf = (link) => {
    if (link.dataset.s === undefined) return link.dataset.tip ? [link.dataset.tip] : [];
    const facts = [];
    for (const same of linksOf(link)) {
      if (same.classList.contains("def") || same.classList.contains("class")) facts.unshift(textOfLine(same.closest("p")));
      if (same.dataset.tip) facts.push(same.dataset.tip);
    }
    return [...new Set(facts)].slice(0, MOST_FACTS);
  };
  const showTip = (event) => {
    const link = nameAt(event);
    const facts = link ? factsOf(link) : [];
    if (!facts.length) return hideTip();
    if (!tip) {
      tip = element("div", { id: "tip", role: "tooltip" });
      document.body.append(tip);
    }
    tip.replaceChildren(...facts.map((fact) => element("div", {}, fact)));
    tip.hidden = false;
    const { left, top, bottom } = link.getBoundingClientRect();
    const below = bottom + 6 + tip.offsetHeight < innerHeight;
    tip.style.left = `${Math.max(8, Math.min(left, innerWidth - tip.offsetWidth - 8))}px`;
    tip.style.top = `${below ? bottom + 6 : top - tip.offsetHeight - 6}px`;
  };
  document.addEventListener("pointerover", showTip);
  document.addEventListener("focusin", showTip);
  document.addEventListener("scroll", hideTip, { capture: true, passive: true });

  // ---- the search ----

  // A class is what one looks for most often, then a function, and so on; letters are those of the data.
  const ORDER = { c: 0, f: 1, t: 2, F: 3, v: 4, a: 5, q: 6, p: 6, i: 7 };
  const WORDS = { c: "class", f: "def", t: "type", F: "file", v: "var", a: "attr", q: "type", p: "param", i: "import" };
  const MOST_FOUND = 60;
  const search = document.getElementById("search");
  const box = search.parentElement;
  const found = element("ul", { id: "found", role: "listbox", "aria-label": "Found" });
  const status = element("p", { class: "spoken", role: "status" });
  found.hidden = true;
  box.hidden = false;
  box.append(found, status);
  for (const [key, value] of [["role", "combobox"], ["aria-autocomplete", "list"], ["aria-controls", "found"], ["aria-expanded", "false"]]) {
    search.setAttribute(key, value);
  }

  // How well a name answers: the same, its beginning, the beginning of a word in it, any part; -1 for not at all.
  const qualityOf = (name, lower, text, lowerText) => {
    const at = lower.indexOf(lowerText);
    if (at < 0) return -1;
    if (name === text) return 0;
    if (lower === lowerText) return 1;
    if (at === 0) return 2;
    const starts = /[^A-Za-z0-9]/.test(name[at - 1]) || (/[A-Z]/.test(name[at]) && /[a-z0-9]/.test(name[at - 1]));
    return starts ? 3 : 4;
  };
  let lowerNames = null;
  let lowerPaths = null;
  const hitsOf = (text, scopes, names, paths) => {
    const dot = text.lastIndexOf(".");
    const isFile = text.includes("/") || /\.pyw?i?$/.test(text);
    const tail = isFile ? text : text.slice(dot + 1);
    const around = !isFile && dot > 0 ? text.slice(0, dot).toLowerCase() : "";
    const lowerTail = tail.toLowerCase();
    const hits = [];
    if (tail && !isFile) {
      names.forEach(([name, kinds, ...places], number) => {
        const quality = qualityOf(name, lowerNames[number], tail, lowerTail);
        if (quality < 0) return;
        for (let i = 0; i < kinds.length; ++i) {
          const scope = scopes[places[i * 3]];
          if (around && !`.${scope.toLowerCase()}`.endsWith(`.${around}`)) continue;
          hits.push({ quality, kind: kinds[i], name, scope, file: places[i * 3 + 1], line: places[i * 3 + 2] });
        }
      });
    }
    paths.forEach((path, file) => {
      const name = isFile ? path : path.slice(path.lastIndexOf("/") + 1);
      const lower = isFile ? lowerPaths[file] : lowerPaths[file].slice(lowerPaths[file].lastIndexOf("/") + 1);
      const quality = qualityOf(name.replace(/\.pyw?i?$/, ""), lower, text, text.toLowerCase());
      if (quality >= 0) hits.push({ quality, kind: "F", name, scope: "", file, line: 1 });
    });
    const depth = ({ scope }) => (scope ? scope.split(".").length : 0);
    return hits.sort((one, two) =>
      one.quality - two.quality || ORDER[one.kind] - ORDER[two.kind] || depth(one) - depth(two)
      || one.name.length - two.name.length || one.file - two.file || one.line - two.line);
  };

  let chosen = -1;
  const choose = (number) => {
    const items = found.children;
    items[chosen]?.removeAttribute("aria-selected");
    chosen = number;
    const item = items[chosen];
    if (!item?.id) return search.removeAttribute("aria-activedescendant");
    item.setAttribute("aria-selected", "true");
    search.setAttribute("aria-activedescendant", item.id);
    // Within the list alone: the page must not move.
    const { offsetTop, offsetHeight } = item;
    if (offsetTop < found.scrollTop) found.scrollTop = offsetTop;
    else if (offsetTop + offsetHeight > found.scrollTop + found.clientHeight) found.scrollTop = offsetTop + offsetHeight - found.clientHeight;
  };
  const setOpen = (isOpen) => {
    found.hidden = !isOpen;
    search.setAttribute("aria-expanded", String(isOpen));
    if (!isOpen) choose(-1);
  };
  const marked = (name, text) => {
    const at = name.toLowerCase().indexOf(text.toLowerCase());
    return at < 0 ? [name] : [name.slice(0, at), element("mark", {}, name.slice(at, at + text.length)), name.slice(at + text.length)];
  };
  let look_ = 0;
  const look = async () => {
    const turn = ++look_;
    const text = search.value.trim();
    if (!text) { status.textContent = ""; return setOpen(false); }
    const [taken, paths] = await Promise.all([load("data/names"), load("data/files")]);
    if (turn !== look_) return;
    const [scopes, names] = taken ?? [[], []];
    lowerNames ??= names.map(([name]) => name.toLowerCase());
    lowerPaths ??= (paths?.[0] ?? []).map((path) => path.toLowerCase());
    const hits = hitsOf(text, scopes, names, paths?.[0] ?? []);
    const tail = text.slice(text.lastIndexOf(".") + 1) || text;
    found.replaceChildren(...hits.slice(0, MOST_FOUND).map(({ kind, name, scope, file, line }, number) => {
      const where = kind === "F" ? paths[0][file] : `${paths[0][file]}:${line}`;
      const target = element("a", { href: kind === "F" ? `${up}files/${file}.html` : `${up}files/${file}.html#L${line}`, tabindex: "-1" },
        element("i", { class: WORDS[kind] }, WORDS[kind]),
        element("span", {}, element("b", {}, ...marked(name, kind === "F" ? text : tail)), scope ? ` ${scope}` : ""),
        element("small", {}, element("bdi", {}, where)));
      return element("li", { role: "option", id: `found${number}` }, target);
    }));
    if (!hits.length) found.append(element("li", { class: "none" }, "Nothing is called that."));
    else if (hits.length > MOST_FOUND) found.append(element("li", { class: "none" }, `and ${counted(hits.length - MOST_FOUND, "more")}`.replace(/s$/, "")));
    status.textContent = hits.length ? counted(hits.length, "result") : "Nothing found";
    chosen = -1;
    setOpen(true);
    found.scrollTop = 0;
    choose(hits.length ? 0 : -1);
  };
  search.addEventListener("input", look);
  search.addEventListener("focus", () => { if (search.value.trim()) look(); else load("data/names"); });
  search.addEventListener("keydown", (event) => {
    const count = found.querySelectorAll("[role=option]").length;
    if (event.key === "ArrowDown" && count) choose((chosen + 1) % count);
    else if (event.key === "ArrowUp" && count) choose((chosen + count - 1) % count);
    else if (event.key === "Enter") {
      const link = found.children[chosen]?.querySelector("a");
      if (link && !found.hidden) { setOpen(false); search.blur(); location.href = link.href; }
    } else return;
    event.preventDefault();
  });
  document.addEventListener("pointerdown", (event) => { if (!box.contains(event.target)) setOpen(false); });
  found.addEventListener("click", () => { setOpen(false); search.blur(); });

  document.addEventListener("keydown", (event) => {
    const isTyping = /^(INPUT|TEXTAREA|SELECT)$/.test(event.target.tagName ?? "");
    if (event.key === "Escape") {
      hideTip();
      if (!found.hidden) setOpen(false);
      else if (event.target === search) search.blur();
      else if (closePanel()) opener?.focus({ preventScroll: true });
      else return;
      event.preventDefault();
    } else if (event.key === "/" && !isTyping && !event.ctrlKey && !event.metaKey && !event.altKey) {
      event.preventDefault();
      search.focus({ preventScroll: true });
      search.select();
    }
  });

  const wanted = /^#n(\d+)$/.exec(location.hash);
  if (wanted && FILE >= 0) show(Number(wanted[1]), null);
})();
