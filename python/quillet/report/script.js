// What a page does beyond its links: the places of a name that is clicked, and the search for definitions.
// Data comes from scripts that call `quillet.loaded` and `quillet.named`; text is only ever set as text.
"use strict";
const quillet = { files: null, shards: new Map(), names: null };
(() => {
  const up = document.currentScript.dataset.up;
  const SHARDS = 64;
  const asked = new Map();
  const load = (name) => {
    if (!asked.has(name)) {
      asked.set(name, new Promise((done, failed) => {
        const script = document.createElement("script");
        script.src = `${up}data/${name}.js`;
        script.onload = done;
        script.onerror = failed;
        document.head.append(script);
      }));
    }
    return asked.get(name);
  };
  quillet.loaded = (number, names) => quillet.shards.set(number, names);
  quillet.named = (names) => { quillet.names = names; };

  const element = (tag, text, attributes = {}) => {
    const made = document.createElement(tag);
    made.textContent = text;
    for (const [key, value] of Object.entries(attributes)) made.setAttribute(key, value);
    return made;
  };
  const link = (file, line, text) => element("a", text, { href: `${up}files/${file}.html#L${line}` });

  // ---- the places of a name ----

  const panel = document.getElementById("panel");
  const close = () => {
    if (panel) panel.hidden = true;
    document.querySelectorAll(".n.on").forEach((name) => name.classList.remove("on"));
  };
  const entryOf = async (number) => {
    await Promise.all([load(number % SHARDS), load("files")]);
    return quillet.shards.get(number % SHARDS)[number];
  };
  const addPlaces = (title, places) => {
    if (!places.length) return;
    panel.append(element("h3", `${title} (${places.length})`));
    const list = element("ul", "");
    for (const [file, line, column, roles] of places) {
      const item = element("li", "");
      item.append(link(file, line, `${quillet.files[file]}:${line}:${column}`), " ", element("small", roles));
      list.append(item);
    }
    panel.append(list);
  };
  const defines = ([, , , roles]) => /class|def|set|parameter|import/.test(roles);
  const show = async (number) => {
    const [name, total, places, related] = await entryOf(number);
    const other = related >= 0 ? await entryOf(related) : null;
    panel.replaceChildren();
    const button = element("button", "Close");
    button.onclick = close;
    panel.append(button, element("h2", name));
    addPlaces("Definitions", places.filter(defines));
    addPlaces("Uses", places.filter((place) => !defines(place)));
    if (total > places.length) panel.append(element("p", `and ${total - places.length} more`));
    if (other) addPlaces(`Definitions of ${other[0]}`, other[2].filter(defines));
    panel.hidden = false;
  };
  document.addEventListener("click", (event) => {
    const name = event.target.closest("a.n");
    if (!name || event.ctrlKey || event.metaKey || event.shiftKey || event.button) return;
    event.preventDefault();
    close();
    document.querySelectorAll(`a.n[data-n="${name.dataset.n}"]`).forEach((same) => same.classList.add("on"));
    show(Number(name.dataset.n));
  });
  document.addEventListener("dblclick", (event) => {
    const name = event.target.closest("a.n");
    if (name) location.href = name.href;
  });

  // ---- the search ----

  const search = document.getElementById("search");
  const found = document.getElementById("found");
  const MOST = 60;
  const look = async () => {
    await Promise.all([load("names"), load("files")]);
    const text = search.value.trim().toLowerCase();
    found.replaceChildren();
    if (text) {
      const rank = ([name]) => (name.toLowerCase() === text ? 0 : name.toLowerCase().startsWith(text) ? 1 : 2);
      const hits = quillet.names.filter(([name]) => name.toLowerCase().includes(text));
      hits.sort((one, two) => rank(one) - rank(two));
      for (const [name, scope, file, line] of hits.slice(0, MOST)) {
        const item = element("li", "");
        const target = link(file, line, scope ? `${scope}.${name} ` : `${name} `);
        target.append(element("small", `${quillet.files[file]}:${line}`));
        item.append(target);
        found.append(item);
      }
      if (!hits.length) found.append(element("li", "nothing found"));
    }
    found.hidden = !text;
  };
  search.addEventListener("input", look);
  document.addEventListener("keydown", (event) => {
    if (event.key === "Escape") {
      close();
      found.hidden = true;
    } else if (event.key === "/" && event.target !== search) {
      event.preventDefault();
      search.focus();
    }
  });
  const wanted = /^#n(\d+)$/.exec(location.hash);
  if (wanted && panel) show(Number(wanted[1]));
})();
