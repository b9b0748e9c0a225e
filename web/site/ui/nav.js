// Navigation between the pane's views: the breadcrumb above the pane (the path from the tree's top
// to the open view, each part clickable), one browser history entry per view (a node selected in
// the tree, a container opened in the pane), so that Back and Forward move between views and never
// leave the page while there is a view to go back to, and the view in the URL
// (?view=<node>&title=<its title>[&object=<container of a media server>][&from=<the tree node it was
// opened from>]), so that a reload or a bookmark opens it again, with its path when the tree has it.
// The tree's expanded nodes are kept in the browser's storage ("harmona.view") and expanded again
// after a reload.
const STORAGE_KEY = "harmona.view";
const MAX_KEPT = 200;        // expanded nodes kept
const MAX_ID = 2048;         // characters of a node id or title taken from the URL or the storage
const KEYBOARD_REST_MS = 300; // arrow keys through the tree: one entry once they rest

// A view: {trail: [{node, title, object?}]}, the last part the one shown.
function checkedPart(part) {
  if (!part || typeof part.node !== "string" || part.node === "" || part.node.length > MAX_ID) return null;
  const title = typeof part.title === "string" ? part.title.slice(0, MAX_ID) : "";
  const checked = { node: part.node, title };
  if (typeof part.object === "string" && part.object.length <= MAX_ID) checked.object = part.object;
  return checked;
}
export function checkedView(view) {
  if (!view || !Array.isArray(view.trail) || view.trail.length === 0 || view.trail.length > 64) return null;
  const trail = view.trail.map(checkedPart);
  return trail.every(Boolean) ? { trail } : null;
}

// The view that the URL names: its last part, after the tree node it was opened from (untitled: the
// rest of the path is found in the tree when it can be).
export function viewOfSearch(search) {
  const params = new URLSearchParams(search);
  const node = params.get("view");
  if (!node) return null;
  const last = { node, title: params.get("title") ?? "", object: params.get("object") ?? undefined };
  const from = params.get("from");
  return checkedView({ trail: from && from !== node ? [{ node: from, title: "" }, last] : [last] });
}
// The URL of `view`, keeping the page's other parameters.
export function searchOfView(search, view) {
  const params = new URLSearchParams(search);
  for (const name of ["view", "title", "object", "from"]) params.delete(name);
  const last = view?.trail.at(-1);
  if (last) {
    params.set("view", last.node);
    if (last.title) params.set("title", last.title);
    if (last.object !== undefined) params.set("object", last.object);
    const from = view.trail.at(-2);
    if (from && from.object === undefined) params.set("from", from.node);
  }
  const text = params.toString();
  return text ? `?${text}` : "";
}
const samePart = (a, b) => a && b && a.node === b.node && a.object === b.object;

// `findItem(id)`: the tree's item of a node, or null; `selectItem(li, {record})`: selects and lists
// it as a click does (record: false when the history moves); `expandItem(li)`: expands it (a
// promise); `listener`: the pane's listing (listen.js); `labels`: the page's words.
export function createNav({ labels, findItem, selectItem, expandItem, listener }) {
  const $ = (id) => document.getElementById(id);
  let current = null; // the view shown
  let pending = 0;    // a keyboard move's entry, not yet recorded
  let pendingView = null;

  // --- the expanded tree ------------------------------------------------------------------------
  function loadStored() {
    try {
      const stored = JSON.parse(localStorage.getItem(STORAGE_KEY) ?? "{}");
      const ids = Array.isArray(stored?.expanded) ? stored.expanded : [];
      return ids.filter((id) => typeof id === "string" && id !== "" && id.length <= MAX_ID).slice(0, MAX_KEPT);
    } catch {
      return [];
    }
  }
  const expanded = new Set(loadStored());
  function store() {
    try {
      localStorage.setItem(STORAGE_KEY, JSON.stringify({ expanded: [...expanded].slice(-MAX_KEPT) }));
    } catch {
      // storage full or refused: the tree is not kept
    }
  }
  function watchTree() {
    new MutationObserver((records) => {
      let changed = false;
      for (const record of records) {
        const li = record.target;
        const id = li.dataset?.id;
        if (!id || li.getAttribute("role") !== "treeitem") continue;
        const open = li.getAttribute("aria-expanded") === "true";
        if (open && !expanded.has(id)) { expanded.add(id); changed = true; }
        // A node that failed to load is not kept expanded; one still loading is.
        if (!open && expanded.has(id) && li.dataset.state !== "loading") { expanded.delete(id); changed = true; }
      }
      if (changed) store();
    }).observe($("tree"), { subtree: true, attributes: true, attributeFilter: ["aria-expanded"] });
  }
  // Expands the kept nodes again, each once its parent is drawn.
  async function expandKept() {
    const tried = new Set();
    for (let depth = 0; depth < 32; depth++) {
      const ready = [...expanded].map((id) => [id, findItem(id)])
        .filter(([id, li]) => li && !tried.has(id) && li.getAttribute("aria-expanded") === "false");
      if (ready.length === 0) return;
      for (const [id] of ready) tried.add(id);
      await Promise.all(ready.map(([, li]) => expandItem(li)));
    }
  }

  // --- the breadcrumb ---------------------------------------------------------------------------
  function drawBreadcrumb(view) {
    const nav = $("breadcrumb");
    const list = $("breadcrumb-list");
    nav.setAttribute("aria-label", labels.navBreadcrumb);
    const items = (view?.trail ?? []).map((part, index, trail) => {
      const li = document.createElement("li");
      if (index === trail.length - 1) {
        const here = document.createElement("span");
        here.className = "crumb-here";
        here.setAttribute("aria-current", "location");
        here.textContent = part.title;
        li.append(here);
      } else {
        const button = document.createElement("button");
        button.type = "button";
        button.className = "crumb";
        button.textContent = part.title;
        button.addEventListener("click", () => go({ trail: trail.slice(0, index + 1) }));
        li.append(button);
      }
      return li;
    });
    list.replaceChildren(...items);
    nav.hidden = items.length === 0;
  }

  // The path of a tree item from the tree's top: its ancestors' texts and its own.
  function treeTrail(li) {
    const trail = [];
    for (let at = li; at; at = at.parentElement?.closest("li[role=treeitem]")) {
      const label = at.querySelector(":scope > .row > .label");
      trail.unshift({ node: at.dataset.id, title: label ? label.textContent : "" });
    }
    return trail;
  }

  // --- history ----------------------------------------------------------------------------------
  function record(view, replace = false) {
    clearTimeout(pending);
    pending = 0;
    const sameView = current && view && samePart(current.trail.at(-1), view.trail.at(-1));
    current = view;
    drawBreadcrumb(view);
    document.body.dataset.view = view ? view.trail.at(-1).node : "";
    const url = searchOfView(location.search, view) || location.pathname;
    if (replace || sameView) history.replaceState({ view }, "", url);
    else history.pushState({ view }, "", url);
  }

  // Shows a view (from the history, the URL or a breadcrumb part) without recording it.
  function show(view) {
    clearTimeout(pending);
    pending = 0;
    current = view;
    drawBreadcrumb(view);
    document.body.dataset.view = view ? view.trail.at(-1).node : "";
    if (!view) {
      for (const old of document.querySelectorAll('#tree li[aria-selected="true"]')) old.setAttribute("aria-selected", "false");
      $("selected").hidden = true;
      $("hint").hidden = false;
      listener.hide();
      return;
    }
    const last = view.trail.at(-1);
    const li = last.object === undefined ? findItem(last.node) : null;
    if (li) {
      selectItem(li, { record: false });
      // The tree knows the path better than a bookmark does.
      if (fromURL(view)) replaceCurrent({ trail: treeTrail(li) });
      return;
    }
    // A view opened from the pane: its path is the tree node's it came from, when the tree has it.
    if (fromURL(view)) {
      const from = view.trail.length === 2 ? findItem(view.trail[0].node) : null;
      replaceCurrent({ trail: from ? [...treeTrail(from), last] : [last] });
    }
    $("hint").hidden = true;
    $("selected").hidden = false;
    $("selected-text").textContent = last.title;
    listener.show(last.node, last.title, last.object);
  }
  // A view read from the URL: its last part, maybe after the untitled node it was opened from.
  function fromURL(view) {
    return view.trail.length === 1 || (view.trail.length === 2 && view.trail[0].title === "");
  }
  function replaceCurrent(view) {
    current = view;
    drawBreadcrumb(current);
    history.replaceState({ view: current }, "", searchOfView(location.search, current) || location.pathname);
  }
  function go(view) {
    record(view);
    show(view);
  }

  // A node selected in the tree (by the keyboard: recorded once the keys rest).
  function treeSelected(li, { keyboard = false } = {}) {
    const view = { trail: treeTrail(li) };
    clearTimeout(pending);
    pending = 0;
    if (!keyboard) {
      record(view);
      return;
    }
    drawBreadcrumb(view);
    pendingView = view;
    pending = setTimeout(() => record(view), KEYBOARD_REST_MS);
  }

  // A container opened from the pane's list: a view below the one shown.
  function open(node, title, object) {
    const part = checkedPart({ node, title, object });
    if (!part) return;
    if (pending) record(pendingView);
    const trail = current ? [...current.trail] : [];
    // A container that is already on the path is gone back to.
    const at = trail.findIndex((p) => samePart(p, part));
    go({ trail: at >= 0 ? trail.slice(0, at + 1) : [...trail, part] });
  }

  // At the start, once the tree's top is drawn: the kept expansions, then the view of the URL.
  async function start() {
    watchTree();
    window.addEventListener("popstate", (event) => show(checkedView(event.state?.view) ?? viewOfSearch(location.search)));
    await expandKept();
    const view = checkedView(history.state?.view) ?? viewOfSearch(location.search);
    if (view) {
      history.replaceState({ view }, "", searchOfView(location.search, view) || location.pathname);
      show(view);
    }
    document.body.dataset.navReady = "true";
  }

  return { start, treeSelected, open };
}
