// The tree page: asks audiotree.cgi for the navigation tree and shows it, as the application's
// left-hand side does. Plain DOM code; every server text is inserted with textContent.
import { parseReply, decodeEntities, languageFromTags, safeIcon, isLazyContainer, nodesOf, REFRESH_TARGETS, BUTTON_IDS } from "./reply.js";
import { LABELS, HTML_LANG } from "./labels.js";
import { format } from "./text.js";
import { createListener, isListable } from "./listen.js";
import { failureCode, splitTracks, isBrowsedLibraryNode } from "./failures.js";
import { askLibrary } from "./library.js";
import { createPlaylists } from "./playlists.js";
import { createRadio, listedRadioNode } from "./radio.js";
import { createCovers } from "./covers.js";
import { createNav } from "./nav.js";
import { createQueue } from "./queue.js";
import { createSession } from "./session.js";
import { createDrawer } from "./phone.js";
import { createSearch } from "./search.js";
import { installShortcuts } from "./keys.js";
import { askLanguages, createLanguagePicker, treeTextTranslator } from "./language.js";

const CGI = "webapi/audiotree.cgi";
const UILANG = "webapi/uilang.cgi";
const BLANK = "3rdparty/Harmona/images/s.gif";
// The keep-alive period; ?keepalive=SECONDS overrides it (the browser tests use a short one).
const KEEPALIVE_MS = (() => {
  const seconds = Number(new URLSearchParams(location.search).get("keepalive"));
  return Number.isFinite(seconds) && seconds >= 1 ? seconds * 1000 : 4 * 60 * 1000;
})();

const page = {
  language: "enu",
  texts: {},     // the UI text tables of the user's language: {section: {key: text}}
  fallback: {},  // the English ones, for a key that a language lacks
  labels: LABELS.enu,
  keepAlives: 0,
  treeText: (text) => text, // a tree node's text in the page's language (language.js)
  listener: null, // the pane's listing and the player (listen.js)
  actions: 0,     // user actions so far: each gets the next number when it starts
  errorOf: 0,     // the action whose failure the status line shows (0: none)
  playlists: null, // the playlist editor (playlists.js)
  radio: null,    // the internet radio pane (radio.js)
  covers: null,   // cover art (covers.js)
  nav: null,      // breadcrumb, history and the kept tree (nav.js)
};
// A user action starts: its number, by which its outcome is ordered among the others. What one
// gesture starts (a click lists a node and opens it) is one action: its parts share the number
// until the gesture's handler has returned, so that one part's success does not clear another's
// failure.
let gesture = 0;
function begin() {
  if (gesture === 0) {
    gesture = ++page.actions;
    queueMicrotask(() => { gesture = 0; });
  }
  return gesture;
}
// An action succeeded: an error of an action that started before it is over.
function succeeded(action) {
  if (page.errorOf !== 0 && page.errorOf < action) showStatus("");
}
const nodeData = new WeakMap(); // li -> the node object as the server sent it
const $ = (id) => document.getElementById(id);

// --- requests --------------------------------------------------------------------------------------
// One CGI request (urlencoded POST). Resolves to parseReply's result, or to
// {kind: "http", status} / {kind: "offline"}.
async function call(params) {
  let response;
  try {
    response = await fetch(CGI, {
      method: "POST",
      body: new URLSearchParams(params),
      credentials: "same-origin",
      cache: "no-store",
    });
  } catch {
    return { kind: "offline" };
  }
  const text = await response.text();
  if (!response.ok) return { kind: "http", status: response.status };
  if (text.trim() === "") return { kind: "http", status: response.status }; // the CGI printed nothing
  return parseReply(text);
}

// Whether a service behind the lists answers (library.cgi's probe): {kind: "ok"} or a failure.
const probe = (service) => askLibrary({ action: "probe", service });

// --- status line -----------------------------------------------------------------------------------
function serverText(section, key) {
  const pick = (table) => (table && table[section] && typeof table[section][key] === "string" ? table[section][key] : null);
  return pick(page.texts) ?? pick(page.fallback);
}
function showStatus(message, isError = false) {
  const status = $("status");
  delete status.dataset.errinfo;
  delete status.dataset.error;
  page.errorOf = 0;
  status.textContent = message;
  status.classList.toggle("error", isError);
  status.setAttribute("role", isError ? "alert" : "status");
  status.title = "";
}
// Shows what went wrong with a reply that was not what the action expects; `action` is the
// number of the action that failed (a later success clears it).
function showFailure(reply, action = begin()) {
  const code = failureCode(reply);
  if (code && page.labels.failures?.[code]) {
    showStatus(page.labels.failures[code], true);
    $("status").dataset.error = code;
    if (reply.errinfo) $("status").title = `${reply.errinfo.sec} / ${reply.errinfo.key}${reply.errinfo.line != null ? " : " + reply.errinfo.line : ""}`;
  } else if (reply.kind === "error" && typeof reply.message === "string" && reply.message !== "") {
    showStatus(reply.message, true);
  } else if (reply.kind === "error") {
    const { sec, key, line } = reply.errinfo;
    showStatus(serverText(sec, key) ?? format(page.labels.unknownError, { sec, key }), true);
    $("status").title = `${sec} / ${key}${line != null ? " : " + line : ""}`;
    $("status").dataset.errinfo = `${sec}/${key}`;
  } else if (reply.kind === "http" && reply.status === 401) {
    showStatus(page.labels.sessionExpired, true);
  } else if (reply.kind === "http") {
    showStatus(format(page.labels.noReply, { status: reply.status }), true);
  } else if (reply.kind === "offline") {
    showStatus(page.labels.offline, true);
  } else {
    showStatus(page.labels.badReply, true);
  }
  page.errorOf = action;
}

// --- tree ------------------------------------------------------------------------------------------
function renderNode(node, depth) {
  const li = document.createElement("li");
  li.setAttribute("role", "treeitem");
  li.setAttribute("aria-selected", "false");
  nodeData.set(li, node);
  const id = typeof node.id === "string" ? node.id : "";
  li.dataset.id = id;
  if (depth === 0) li.classList.add("category");
  if (BUTTON_IDS.has(id)) li.classList.add("button");

  const row = document.createElement("div");
  row.className = "row";
  row.tabIndex = -1;
  const twisty = document.createElement("span");
  twisty.className = "twisty";
  twisty.setAttribute("aria-hidden", "true");
  const icon = document.createElement("img");
  icon.className = "icon";
  icon.alt = "";
  icon.src = safeIcon(node.icon) ?? BLANK;
  if (node.iconCls === "x-tree-hide-icon" || !safeIcon(node.icon)) icon.classList.add("hidden");
  const label = document.createElement("span");
  label.className = "label";
  label.textContent = page.treeText(decodeEntities(node.text), id);
  row.title = page.treeText(decodeEntities(node.qtip ?? node.text), id);
  row.append(twisty, icon, label);
  li.append(row);

  const group = document.createElement("ul");
  group.setAttribute("role", "group");
  group.hidden = true;
  li.append(group);
  li.dataset.depth = String(depth);

  if (Array.isArray(node.children)) {
    li.setAttribute("aria-expanded", "false");
    li.dataset.state = "inline";
    if (node.expanded === true) expand(li);
  } else if (isLazyContainer(node)) {
    li.setAttribute("aria-expanded", "false");
    li.dataset.state = "lazy";
  }
  return li;
}

// The tree holds containers only: the tracks among `nodes` are listed in the pane, never drawn
// here; a container of tracks alone says so instead.
function fillGroup(li, nodes) {
  const group = li.querySelector(":scope > ul");
  const depth = Number(li.dataset.depth) + 1;
  const { containers, tracks } = splitTracks(nodes);
  group.replaceChildren(...containers.map((node) => renderNode(node, depth)));
  li.dataset.tracks = String(tracks);
  if (containers.length > 0) return;
  if (tracks === 0) {
    showEmpty(li);
    return;
  }
  const note = document.createElement("li");
  note.className = "note";
  note.setAttribute("role", "none");
  note.textContent = page.labels.tracksInList;
  group.replaceChildren(note);
}
function showEmpty(li) {
  const group = li.querySelector(":scope > ul");
  const empty = document.createElement("li");
  empty.className = "empty";
  empty.setAttribute("role", "none");
  empty.textContent = page.labels.empty;
  group.replaceChildren(empty);
}

async function expand(li) {
  const group = li.querySelector(":scope > ul");
  const node = nodeData.get(li);
  if (li.dataset.state === "inline") {
    fillGroup(li, nodesOf(node.children));
    li.dataset.state = "loaded";
  } else if (li.dataset.state === "lazy" || li.dataset.state === "failed") {
    const action = begin();
    li.dataset.state = "loading";
    li.setAttribute("aria-busy", "true");
    let reply = await call({ action: "gettreenode", node: node.id });
    // The tree CGI answers a failed browse of the library, and a container that has left the
    // library since the tree was drawn, as an empty one: an empty container is shown empty only
    // while the media server answers and library.cgi still knows the node.
    if (reply.kind === "nodes" && reply.nodes.length === 0 && isBrowsedLibraryNode(node.id)) {
      const server = await probe("media_server");
      if (server.kind !== "ok") reply = server;
      else {
        const listed = await askLibrary({ action: "list", node: node.id });
        if (failureCode(listed) === "node_gone") reply = listed;
      }
    }
    li.removeAttribute("aria-busy");
    if (reply.kind === "nodes") {
      fillGroup(li, reply.nodes);
      li.dataset.state = "loaded";
      succeeded(action);
    } else {
      li.dataset.state = "failed";
      li.setAttribute("aria-expanded", "false");
      if (failureCode(reply) === "node_gone") li.dataset.gone = "true";
      showFailure(reply, action);
      return;
    }
  }
  group.hidden = false;
  li.setAttribute("aria-expanded", "true");
}
function collapse(li) {
  li.querySelector(":scope > ul").hidden = true;
  li.setAttribute("aria-expanded", "false");
}
function toggle(li) {
  if (!li.hasAttribute("aria-expanded") || li.dataset.state === "loading") return;
  if (li.getAttribute("aria-expanded") === "true") collapse(li);
  else expand(li);
}

// `keyboard`: moved to by the arrow keys, so the pane lists it only once the keys rest.
// `record`: a view of its own in the browser's history (false when the history moves to it).
function select(li, { keyboard = false, record = true } = {}) {
  for (const old of document.querySelectorAll('li[aria-selected="true"]')) old.setAttribute("aria-selected", "false");
  li.setAttribute("aria-selected", "true");
  const row = li.querySelector(":scope > .row");
  row.focus();
  const node = nodeData.get(li);
  $("hint").hidden = true;
  $("selected").hidden = false;
  const title = page.treeText(decodeEntities(node.text), node.id);
  $("selected-text").textContent = title;
  $("selected-icon").src = safeIcon(node.icon) ?? BLANK;
  if (record) page.nav?.treeSelected(li, { keyboard });
  if (page.listener) {
    page.radio?.select(node.id, title);
    const listed = listedRadioNode(node.id);
    if (isListable(listed)) page.listener.show(listed, title, undefined, { defer: keyboard ? 300 : 0 });
    else page.listener.hide();
  }
}

// A refresh button: asks for the category's children again and puts them after its buttons.
async function refresh(buttonLi) {
  const target = REFRESH_TARGETS[buttonLi.dataset.id];
  const category = buttonLi.parentElement.closest("li[role=treeitem]");
  if (!category || category.getAttribute("aria-busy") === "true") return;
  const action = begin();
  category.setAttribute("aria-busy", "true");
  let reply = await call({ action: "refresh", target });
  // The tree CGI answers a search that the audio daemon could not make as one that found no
  // server: no server found counts only while the daemon answers; the old list stays otherwise.
  if (reply.kind === "success" && target === "mediaserver" && reply.items.length === 0) {
    const daemon = await probe("audio_daemon");
    if (daemon.kind !== "ok") reply = daemon;
  }
  category.removeAttribute("aria-busy");
  if (reply.kind !== "success") {
    showFailure(reply, action);
    return;
  }
  const group = category.querySelector(":scope > ul");
  for (const child of [...group.children])
    if (!(child.dataset.id && BUTTON_IDS.has(child.dataset.id))) child.remove();
  const depth = Number(category.dataset.depth) + 1;
  group.append(...reply.items.map((node) => renderNode(node, depth)));
  category.dataset.refreshed = String(Number(category.dataset.refreshed ?? 0) + 1);
  showStatus(page.labels.refreshed);
}

function activate(li) {
  select(li);
  if (page.playlists?.isNewButton(li.dataset.id)) page.playlists.create(li.dataset.id);
  else if (REFRESH_TARGETS[li.dataset.id]) refresh(li);
  else toggle(li);
}

function visibleRows() {
  return [...document.querySelectorAll("#tree li[role=treeitem]")].filter((li) => li.offsetParent !== null);
}
function onKey(event) {
  const li = event.target.closest("li[role=treeitem]");
  if (!li) return;
  const rows = visibleRows();
  const at = rows.indexOf(li);
  const expanded = li.getAttribute("aria-expanded");
  switch (event.key) {
    case "Enter": case " ": activate(li); break;
    case "ArrowDown": if (rows[at + 1]) select(rows[at + 1], { keyboard: true }); break;
    case "ArrowUp": if (at > 0) select(rows[at - 1], { keyboard: true }); break;
    case "ArrowRight": if (expanded === "false") expand(li); break;
    case "ArrowLeft":
      if (expanded === "true") collapse(li);
      else { const parent = li.parentElement.closest("li[role=treeitem]"); if (parent) select(parent, { keyboard: true }); }
      break;
    default: return;
  }
  event.preventDefault();
}

// --- actions ---------------------------------------------------------------------------------------
// One Random 100: the user's own draw, which this button makes afresh and which the tree's
// Random 100 node lists in the pane (the tree shows no tracks of it). `quiet`: drawn because the
// node was opened before any draw, said nowhere.
const RANDOM_NODE = "musiclib_random";
async function draw(quiet) {
  const action = begin();
  const reply = await call({ action: "rerandom100" });
  if (reply.kind !== "success") {
    showFailure(reply, action);
    return false;
  }
  if (!quiet) showStatus(page.labels.rerandomDone);
  document.body.dataset.rerandom = String(Number(document.body.dataset.rerandom ?? 0) + 1);
  return true;
}
async function rerandom() {
  const button = $("rerandom");
  button.disabled = true;
  const drawn = await draw(false);
  button.disabled = false;
  if (drawn) page.listener.reload(RANDOM_NODE);
}

async function keepAlive() {
  const reply = await call({ action: "avoid_timeout" });
  page.keepAlives += 1;
  document.body.dataset.keepalive = String(page.keepAlives);
  if (reply.kind === "http" && reply.status === 401) showFailure(reply);
}

// --- start -----------------------------------------------------------------------------------------
async function loadLanguage() {
  const languages = await askLanguages();
  if (languages) return languages;
  try {
    const response = await fetch(UILANG, { credentials: "same-origin", cache: "no-store" });
    const reply = await response.json();
    if (typeof reply.language === "string" && /^[a-z]{3}$/.test(reply.language)) return { language: reply.language, tree: reply.language };
  } catch {
    // below
  }
  const language = languageFromTags(navigator.languages?.length ? navigator.languages : [navigator.language]);
  return { language, tree: language };
}
async function loadTexts() {
  try {
    const response = await fetch("ui/texts.json", { credentials: "same-origin" });
    return await response.json();
  } catch {
    return {};
  }
}

async function start() {
  const [{ language, tree: treeLanguage, saved }, texts] = await Promise.all([loadLanguage(), loadTexts()]);
  page.language = language;
  page.treeText = treeTextTranslator(texts, treeLanguage, language);
  page.texts = texts[language] ?? texts.enu ?? {};
  page.fallback = texts.enu ?? {};
  page.labels = { ...LABELS.enu, ...(LABELS[language] ?? {}) };
  document.documentElement.lang = HTML_LANG[language] ?? "en";
  document.body.dataset.language = language;
  document.title = page.labels.title;
  $("title").textContent = page.labels.title;
  $("tree").setAttribute("aria-label", page.labels.tree);
  $("hint").textContent = page.labels.hint;
  $("rerandom").textContent = page.labels.rerandom;
  $("rerandom").addEventListener("click", rerandom);
  page.playlists = createPlaylists({
    labels: page.labels,
    onStatus: (message) => showStatus(message),
    onFailure: (message) => showStatus(message, true),
    // A category's children again (its refresh button), then a node of it selected.
    refreshCategory: (id) => {
      const button = document.querySelector(`li[data-id="${id}_refresh"]`);
      return button ? refresh(button) : Promise.resolve();
    },
    selectNode: (id) => {
      const li = [...document.querySelectorAll("#tree li[role=treeitem]")].find((l) => l.dataset.id === id);
      if (li) {
        for (let up = li.parentElement.closest("li[role=treeitem]"); up; up = up.parentElement.closest("li[role=treeitem]"))
          if (up.getAttribute("aria-expanded") === "false") expand(up);
        select(li);
      }
    },
    reshow: (node, title) => page.listener.show(node, title),
    categoryNodes: (id) => {
      const li = document.querySelector(`li[data-id="${id}"]`);
      if (!li) return [];
      const rendered = [...li.querySelectorAll(":scope > ul > li[role=treeitem]")];
      return rendered.length > 0 ? rendered.map((c) => nodeData.get(c)) : nodesOf(nodeData.get(li)?.children);
    },
  });
  page.covers = createCovers({ labels: page.labels });
  // The play queue that the player plays, the system's media controls, the phone's tree drawer.
  page.queue = createQueue({ labels: page.labels, onStatus: showStatus });
  createDrawer({ labels: page.labels, chosen: (id) => isListable(listedRadioNode(id)) });
  page.listener = createListener({
    extendList: (...args) => page.covers.extendList(...args),
    decorateContainers: (...args) => page.covers.decorateContainers(...args),
    decorateCover: (...args) => page.covers.decorateRow(...args),
    onPlay: (track) => page.covers.playing(track),
    openContainer: (...args) => page.nav.open(...args),
    queue: page.queue,
    onPlayerLoad: (item) => page.session?.loaded(item),
    decorateRow: (...args) => page.playlists.decorateRow(...args),
    onListed: (...args) => page.playlists.listed(...args),
    labels: page.labels,
    language: HTML_LANG[language] ?? "en",
    begin,
    onFailure: (reply, action, node) => {
      const radioWords = page.radio?.failure(reply);
      if (radioWords) showStatus(radioWords, true);
      else showFailure(reply, action);
      // A node that no longer exists is marked so in the tree.
      if (failureCode(reply) === "node_gone")
        for (const li of document.querySelectorAll("#tree li[role=treeitem]")) if (li.dataset.id === node) li.dataset.gone = "true";
    },
    onSuccess: (action, node) => {
      succeeded(action);
      for (const li of document.querySelectorAll("#tree li[role=treeitem][data-gone]")) if (li.dataset.id === node) delete li.dataset.gone;
    },
    onStatus: showStatus,
    drawRandom: () => draw(true),
  });
  page.session = createSession({ audio: $("audio"), queue: page.queue, coverUrl: (item) => (typeof item?.stream === "string" ? page.covers.coverUrl(item) : "") });
  page.queue.restore();
  page.radio = createRadio({ labels: page.labels, listener: page.listener, showStatus, showFailure });
  page.nav = createNav({
    labels: page.labels,
    listener: page.listener,
    findItem: (id) => [...document.querySelectorAll("#tree li[role=treeitem]")].find((li) => li.dataset.id === id) ?? null,
    selectItem: (li, options) => select(li, options),
    expandItem: (li) => expand(li),
  });
  createSearch({
    labels: page.labels,
    playTracks: (tracks, index) => page.listener.playTracks(tracks, index),
    openNode: (node, title) => page.listener.show(node, title),
    onFailure: (reply) => { if (failureCode(reply) === "login_expired") showFailure(reply); },
  });
  installShortcuts();
  createLanguagePicker({ labels: page.labels, saved, showStatus, showFailure });

  const tree = $("tree");
  tree.addEventListener("click", (event) => {
    const li = event.target.closest("li[role=treeitem]");
    if (!li) return;
    if (event.target.classList.contains("twisty")) toggle(li);
    else activate(li);
  });
  tree.addEventListener("keydown", onKey);

  showStatus(page.labels.loading);
  const reply = await call({ action: "gettreenode", node: "audiotree_root" });
  const nodes = reply.kind === "nodes" ? reply.nodes : reply.kind === "error" || reply.kind === "success" ? reply.items : [];
  tree.replaceChildren(...nodes.map((node) => renderNode(node, 0)));
  tree.removeAttribute("aria-busy");
  const first = tree.querySelector("li[role=treeitem] > .row");
  if (first) first.tabIndex = 0;
  if (reply.kind === "nodes") showStatus("");
  else showFailure(reply);
  $("rerandom").disabled = false;
  document.body.dataset.ready = "true";
  page.nav.start();
  setInterval(keepAlive, KEEPALIVE_MS);
}

start();
