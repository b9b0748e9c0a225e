// The play queue: the one list the player plays. "Play all" and a click on a row replace it with the
// listed rows (the rows put in by hand that have not played yet stay, next); "Play next" and "Add to
// queue" put rows after the playing one or at its end; its panel (opened from the player bar)
// removes, reorders (drag, or the move buttons) and clears. Shuffle
// plays the items in a random order kept beside the queue's own; repeat plays one item again, or
// the whole queue again. The queue, the playing item, the time in it and the volume are kept in the
// browser's storage and put back paused after a reload.
import { counted, format } from "./text.js";
export const QUEUE_KEY = "harmona.queue";
export const PLAYER_KEY = "harmona.player";
export const QUEUE_LIMIT = 20000; // items; more is refused with a word to the user
export const REPEAT_MODES = ["off", "one", "all"];

const MAX_TEXT = 2048;   // characters of one stored field
const MAX_FIELDS = 24;   // fields of one stored item
const STREAM = /^[0-9]{1,18}(\.[A-Za-z0-9]{1,8})?$/;

// The fields of a listed row that the queue keeps (and stores): scalars only, bounded; a row that
// names neither a stream of the library nor an http(s) address is not playable and is dropped.
export function queueItem(track, node = "", index = -1) {
  if (!track || typeof track !== "object") return null;
  const item = {};
  let count = 0;
  for (const [name, value] of Object.entries(track)) {
    if (count >= MAX_FIELDS) break;
    if (name === "key" || name === "from" || name === "at" || !/^[A-Za-z][A-Za-z0-9_]{0,31}$/.test(name)) continue;
    if (typeof value === "string" && value.length <= MAX_TEXT) item[name] = value;
    else if (typeof value === "number" && Number.isFinite(value)) item[name] = value;
    else if (typeof value === "boolean") item[name] = value;
    else continue;
    count += 1;
  }
  const stream = typeof item.stream === "string" && STREAM.test(item.stream);
  // A station's own stream, or this site's own path for a track it fetches (another media server's
  // track, a directory's station): library.cgi's, relative to the page.
  const url = typeof item.url === "string" && (/^https?:\/\/[^\s]+$/i.test(item.url) || /^webapi\/library\.cgi\?[^\s]+$/.test(item.url));
  if (!url) delete item.url;
  if (!stream) delete item.stream;
  if (!stream && !url) return null;
  item.from = typeof node === "string" && node.length <= MAX_TEXT ? node : "";
  item.at = Number.isInteger(index) && index >= 0 ? index : -1;
  return item;
}

function shuffled(values, random) {
  const out = values.slice();
  for (let i = out.length - 1; i > 0; i--) {
    const j = Math.floor(random() * (i + 1));
    [out[i], out[j]] = [out[j], out[i]];
  }
  return out;
}

// The queue without the page: items (each with a `key` of its own), the playing one, shuffle's
// order (keys) and repeat. `random` is Math.random unless a test gives its own.
export function createQueueModel(random = Math.random) {
  let next = 1;
  const m = {
    items: [],
    current: null, // the playing item's key
    shuffle: false,
    order: [],     // shuffle's play order: every item's key once
    repeat: "off",
  };
  const keyed = (item) => ({ ...item, key: next++ });
  // A row put in the queue by hand ("Play next", "Add to queue"): a new list played keeps it.
  const picked = (item) => ({ ...keyed(item), picked: true });
  const indexOf = (key) => m.items.findIndex((i) => i.key === key);

  m.position = () => (m.current === null ? -1 : indexOf(m.current));
  m.currentItem = () => m.items[m.position()] ?? null;
  m.room = () => QUEUE_LIMIT - m.items.length;

  // The rows put in the queue by hand that have not played yet, in play order.
  const waitingPicks = () => {
    const byKey = new Map(m.items.map((item) => [item.key, item]));
    const keys = m.shuffle ? m.order : m.items.map((i) => i.key);
    const after = m.current === null ? 0 : keys.indexOf(m.current) + 1;
    return keys.slice(after).map((key) => byKey.get(key)).filter((item) => item?.picked);
  };
  // The listed rows, playing the one at `start`; -1: the first in play order (in shuffle, any).
  // The rows put in the queue by hand that have not played yet stay: they play right after the
  // chosen row, before the rest of the list.
  m.replace = (items, start = 0) => {
    const picks = waitingPicks();
    const listed = items.slice(0, Math.max(0, QUEUE_LIMIT - picks.length)).map(keyed);
    const at = start < 0 ? (m.shuffle ? Math.floor(random() * listed.length) : 0) : Math.min(start, listed.length - 1);
    const first = listed[at];
    m.items = first ? [...listed.slice(0, at + 1), ...picks, ...listed.slice(at + 1)] : picks;
    m.current = first ? first.key : null;
    if (m.shuffle) {
      m.reshuffle();
      const pickKeys = new Set(picks.map((i) => i.key));
      m.order = [...m.order.slice(0, 1), ...picks.map((i) => i.key), ...m.order.slice(1).filter((k) => !pickKeys.has(k))];
    }
    return m.currentItem();
  };
  // Puts `items` right after the playing one (at the start when nothing plays); in shuffle they
  // play next too, in their own order.
  m.playNext = (items) => {
    const added = items.slice(0, m.room()).map(picked);
    const at = m.position() + 1;
    m.items.splice(at, 0, ...added);
    if (m.shuffle) {
      const pos = m.current === null ? 0 : m.order.indexOf(m.current) + 1;
      m.order.splice(pos, 0, ...added.map((i) => i.key));
    }
    if (m.current === null && added.length > 0) m.current = added[0].key;
    return added.length;
  };
  // Puts `items` at the end; in shuffle each goes to a random place after the playing one.
  m.add = (items) => {
    const added = items.slice(0, m.room()).map(picked);
    m.items.push(...added);
    if (m.shuffle)
      for (const item of added) {
        const from = m.current === null ? 0 : m.order.indexOf(m.current) + 1;
        const at = from + Math.floor(random() * (m.order.length - from + 1));
        m.order.splice(at, 0, item.key);
      }
    if (m.current === null && added.length > 0) m.current = added[0].key;
    return added.length;
  };
  // Removes the item at `index`. The playing one removed: the one after it plays in its place
  // (true is returned then), or nothing when it was the last.
  m.remove = (index) => {
    const item = m.items[index];
    if (!item) return false;
    let successor = null;
    if (item.key === m.current) successor = m.peek(1, { wrap: false })?.key ?? null;
    m.items.splice(index, 1);
    if (m.shuffle) m.order.splice(m.order.indexOf(item.key), 1);
    if (item.key !== m.current) return false;
    m.current = successor;
    return true;
  };
  // Moves the item at `from` to `to` (both indexes of the queue as it is before the move).
  m.move = (from, to) => {
    if (from === to || !m.items[from] || to < 0 || to >= m.items.length) return false;
    const [item] = m.items.splice(from, 1);
    m.items.splice(to, 0, item);
    return true;
  };
  m.clear = () => {
    m.items = [];
    m.order = [];
    m.current = null;
  };
  m.reshuffle = () => {
    const rest = shuffled(m.items.filter((i) => i.key !== m.current).map((i) => i.key), random);
    m.order = m.current === null ? rest : [m.current, ...rest];
  };
  m.setShuffle = (on) => {
    m.shuffle = Boolean(on);
    if (m.shuffle) m.reshuffle();
    else m.order = [];
  };
  m.setRepeat = (mode) => {
    if (REPEAT_MODES.includes(mode)) m.repeat = mode;
  };
  // The item `delta` steps away in play order (the queue's, or shuffle's), or null past an end.
  // `wrap`: past an end comes the other end (repeat all).
  m.peek = (delta, { wrap = m.repeat === "all" } = {}) => {
    const keys = m.shuffle ? m.order : m.items.map((i) => i.key);
    if (keys.length === 0) return null;
    const at = m.current === null ? (delta > 0 ? -1 : keys.length) : keys.indexOf(m.current);
    let to = at + delta;
    if (to < 0 || to >= keys.length) {
      if (!wrap) return null;
      to = ((to % keys.length) + keys.length) % keys.length;
    }
    return m.items[indexOf(keys[to])] ?? null;
  };
  // Steps to the next or previous item; null (and nothing changes) past an end.
  m.step = (delta) => {
    // Repeat all in shuffle: a new order for the next round, this item not first.
    if (m.shuffle && m.repeat === "all" && delta > 0 && m.order.at(-1) === m.current && m.items.length > 1) {
      const last = m.current;
      m.order = shuffled(m.items.map((i) => i.key), random);
      if (m.order[0] === last) m.order.push(m.order.shift());
      m.current = m.order[0];
      return m.currentItem();
    }
    const item = m.peek(delta);
    if (item) m.current = item.key;
    return item;
  };
  // What plays after the playing one ended by itself: itself again under repeat one.
  m.afterEnd = () => (m.repeat === "one" ? m.currentItem() : m.step(1));
  m.jump = (index) => {
    const item = m.items[index];
    if (item) m.current = item.key;
    return item ?? null;
  };

  // --- storage -------------------------------------------------------------------------------------
  m.save = (limit = QUEUE_LIMIT) => {
    let items = m.items;
    let position = m.position();
    // A window around the playing item when the whole queue does not fit.
    if (items.length > limit) {
      const from = Math.max(0, Math.min(position - Math.floor(limit / 2), items.length - limit));
      items = items.slice(from, from + limit);
      position = position < 0 ? -1 : position - from;
    }
    const index = new Map(items.map((item, i) => [item.key, i]));
    const stored = items.map(({ key, ...rest }) => rest);
    const order = m.shuffle ? m.order.filter((k) => index.has(k)).map((k) => index.get(k)) : [];
    return { version: 1, items: stored, position, shuffle: m.shuffle, repeat: m.repeat, order };
  };
  // Puts back what save() wrote; anything else leaves the queue empty. Every field is checked.
  m.load = (value) => {
    m.clear();
    m.shuffle = false;
    m.repeat = "off";
    if (!value || typeof value !== "object" || value.version !== 1 || !Array.isArray(value.items)) return false;
    const items = [];
    for (const stored of value.items.slice(0, QUEUE_LIMIT)) {
      const item = queueItem(stored, stored?.from, stored?.at);
      if (item) items.push(keyed(item));
      else return m.clear(), false;
    }
    m.items = items;
    if (Number.isInteger(value.position) && value.position >= 0 && value.position < items.length) m.current = items[value.position].key;
    else if (items.length > 0) m.current = items[0].key;
    if (REPEAT_MODES.includes(value.repeat)) m.repeat = value.repeat;
    if (value.shuffle === true) {
      m.shuffle = true;
      const order = Array.isArray(value.order) ? value.order : [];
      const valid = order.length === items.length && order.every((i) => Number.isInteger(i) && i >= 0 && i < items.length) &&
        new Set(order).size === items.length;
      if (valid) m.order = order.map((i) => items[i].key);
      else m.reshuffle();
    }
    return true;
  };
  return m;
}

// The player's own state kept across a reload: the time in the playing item and the volume.
export function readPlayerState(value) {
  const out = { time: 0, volume: 1 };
  if (!value || typeof value !== "object") return out;
  if (typeof value.time === "number" && Number.isFinite(value.time) && value.time >= 0 && value.time < 1e7) out.time = value.time;
  if (typeof value.volume === "number" && Number.isFinite(value.volume) && value.volume >= 0 && value.volume <= 1) out.volume = value.volume;
  return out;
}

function readStorage(key) {
  try {
    const text = localStorage.getItem(key);
    if (text === null || text.length > 16 * 1024 * 1024) return null;
    return JSON.parse(text);
  } catch {
    return null;
  }
}
function writeStorage(key, value) {
  try {
    localStorage.setItem(key, JSON.stringify(value));
    return true;
  } catch {
    return false; // full, or storage refused: the page works on without it
  }
}

// --- the page ----------------------------------------------------------------------------------------
const $ = (id) => document.getElementById(id);

function iconButton(className, label, onClick) {
  const b = document.createElement("button");
  b.type = "button";
  b.className = `icon-button ${className}`;
  b.title = label;
  b.setAttribute("aria-label", label);
  b.addEventListener("click", (event) => {
    event.stopPropagation();
    onClick(event);
  });
  return b;
}

// `onStatus(text, isError)`: the page's status line. attach(player) connects the player bar
// (listen.js): player.load(item, {autoplay, time}), player.stop(), player.redraw(), player.list().
export function createQueue({ labels, onStatus = () => {}, random = Math.random }) {
  const model = createQueueModel(random);
  let player = null;
  let saveTimer = 0;
  let lastTimeSave = 0;
  let restoredTime = null; // the saved time until the restored item is seeked to it (or plays)
  const panel = $("queue-panel");
  const viewport = $("queue-list");
  const spacer = $("queue-spacer");
  const audio = $("audio");
  const drag = { key: null, from: -1, to: -1, pointer: null };

  const rowHeight = () => Number.parseFloat(getComputedStyle(viewport).getPropertyValue("--queue-row-height")) || 36;

  // --- storage ------------------------------------------------------------------------------------
  function saveQueue() {
    clearTimeout(saveTimer);
    saveTimer = 0;
    // A queue too large for the storage keeps a window around the playing item.
    for (const limit of [QUEUE_LIMIT, 2000, 200]) if (writeStorage(QUEUE_KEY, model.save(limit))) return;
  }
  function changed() {
    if (!saveTimer) saveTimer = setTimeout(saveQueue, 0);
    draw();
    player?.redraw();
  }
  function savePlayer() {
    lastTimeSave = Date.now();
    const time = restoredTime ?? (Number.isFinite(audio.currentTime) ? audio.currentTime : 0);
    writeStorage(PLAYER_KEY, { time, volume: audio.volume });
  }

  // --- playing ------------------------------------------------------------------------------------
  function load(item, autoplay) {
    if (!player) return;
    restoredTime = null;
    if (item) player.load(item, { autoplay });
    else player.stop();
    savePlayer();
    changed();
    if (item) scrollToCurrent();
  }
  function rowsToItems(tracks, node, from = 0) {
    const items = [];
    tracks.forEach((track, i) => {
      const item = queueItem(track, node, from + i);
      if (item) items.push(item);
    });
    return items;
  }
  // The listed rows become the queue, the one at `index` playing.
  function replace(tracks, node, index) {
    const items = [];
    let start = index < 0 ? -1 : 0;
    tracks.forEach((track, i) => {
      const item = queueItem(track, node, i);
      if (!item) return;
      if (i === index) start = items.length;
      items.push(item);
    });
    if (tracks.length > QUEUE_LIMIT) onStatus(format(labels.queueFull, { max: QUEUE_LIMIT }), true);
    load(model.replace(items, start), true);
  }
  function step(delta) {
    const item = model.step(delta);
    if (item) load(item, true);
  }
  // The playing item ended by itself: the next in play order, or itself under repeat one.
  function ended() {
    const item = model.afterEnd();
    if (item) load(item, true);
    else changed();
  }
  function jump(index) {
    const item = model.jump(index);
    if (item) load(item, true);
  }

  function enqueue(tracks, node, first, how) {
    const items = rowsToItems(tracks, node, first);
    if (items.length === 0) return;
    const wasEmpty = model.current === null;
    const count = how === "next" ? model.playNext(items) : model.add(items);
    if (count < items.length) onStatus(format(labels.queueFull, { max: QUEUE_LIMIT }), true);
    if (count > 0) onStatus(counted(labels, how === "next" ? "queuedNext" : "queuedAdded", count));
    // The first items of an empty queue are loaded, not played: the user asked for a queue.
    if (wasEmpty && model.currentItem()) load(model.currentItem(), false);
    else changed();
  }

  function remove(index) {
    const wasPlaying = !audio.paused;
    const playingRemoved = model.remove(index);
    if (playingRemoved) load(model.currentItem(), wasPlaying);
    else changed();
  }
  function move(from, to, focusClass) {
    if (!model.move(from, to)) return;
    changed();
    // The keyboard stays with the moved item.
    if (focusClass) {
      const key = model.items[to].key;
      scrollToIndex(to);
      const row = spacer.querySelector(`[data-key="${key}"]`);
      const button = row?.querySelector(`.${focusClass}:not([disabled])`) ?? row?.querySelector(".queue-remove");
      button?.focus();
    }
  }
  function clear() {
    model.clear();
    load(null, false);
    onStatus(labels.queueCleared);
  }

  // --- the panel ----------------------------------------------------------------------------------
  function scrollToIndex(index) {
    const h = rowHeight();
    const top = index * h;
    if (top < viewport.scrollTop) viewport.scrollTop = top;
    else if (top + h > viewport.scrollTop + viewport.clientHeight) viewport.scrollTop = top + h - viewport.clientHeight;
    draw();
  }
  function scrollToCurrent() {
    if (!panel.hidden && model.position() >= 0) scrollToIndex(model.position());
  }

  function queueRow(item, index) {
    const h = rowHeight();
    const row = document.createElement("div");
    row.className = "queue-item";
    row.setAttribute("role", "listitem");
    row.setAttribute("aria-setsize", String(model.items.length));
    row.setAttribute("aria-posinset", String(index + 1));
    row.dataset.key = String(item.key);
    row.dataset.index = String(index);
    row.dataset.stream = String(item.stream ?? item.url ?? "");
    row.style.top = `${index * h}px`;
    if (item.key === model.current) {
      row.classList.add("current");
      row.setAttribute("aria-current", "true");
    }
    if (drag.key === item.key) row.classList.add("dragged");
    const handle = document.createElement("span");
    handle.className = "queue-drag";
    handle.title = labels.queueDrag;
    handle.setAttribute("aria-hidden", "true");
    handle.addEventListener("pointerdown", (event) => startDrag(event, item.key, index));
    const title = document.createElement("button");
    title.type = "button";
    title.className = "queue-title";
    const name = document.createElement("span");
    name.className = "queue-name";
    name.textContent = String(item.title ?? item.stream ?? item.url ?? "");
    const artist = document.createElement("span");
    artist.className = "queue-artist";
    artist.textContent = String(item.artist ?? "");
    title.append(name, artist);
    title.addEventListener("click", () => jump(Number(row.dataset.index)));
    const up = iconButton("queue-up", labels.queueUp, () => move(index, index - 1, "queue-up"));
    up.disabled = index === 0;
    const down = iconButton("queue-down", labels.queueDown, () => move(index, index + 1, "queue-down"));
    down.disabled = index === model.items.length - 1;
    const removeButton = iconButton("queue-remove", labels.queueRemove, () => {
      remove(index);
      const next = spacer.querySelector(`[data-index="${Math.min(index, model.items.length - 1)}"] .queue-remove`);
      (next ?? $("queue-close")).focus();
    });
    for (const b of [up, down, removeButton]) b.setAttribute("aria-label", `${b.title}: ${name.textContent}`);
    row.append(handle, title, up, down, removeButton);
    return row;
  }

  // Draws the rows in view only, as the track list does: a queue of 10,000 items stays light.
  function draw() {
    $("queue-count").textContent = counted(labels, "queueCount", model.items.length);
    $("queue-clear").disabled = model.items.length === 0;
    $("queue-empty").hidden = model.items.length > 0;
    viewport.hidden = model.items.length === 0;
    panel.dataset.count = String(model.items.length);
    panel.dataset.position = String(model.position());
    if (panel.hidden) return;
    const h = rowHeight();
    spacer.style.height = `${model.items.length * h}px`;
    const first = Math.max(0, Math.floor(viewport.scrollTop / h) - 6);
    const last = Math.min(model.items.length, first + Math.ceil((viewport.clientHeight || 400) / h) + 12);
    const focused = document.activeElement && spacer.contains(document.activeElement)
      ? { key: document.activeElement.closest(".queue-item")?.dataset.key, cls: [...document.activeElement.classList].find((c) => c.startsWith("queue-")) }
      : null;
    const rows = [];
    for (let i = first; i < last; i++) rows.push(queueRow(model.items[i], i));
    spacer.replaceChildren(...rows);
    if (drag.key !== null && drag.to >= 0) {
      const mark = document.createElement("div");
      mark.className = "queue-drop";
      mark.setAttribute("aria-hidden", "true");
      mark.style.top = `${(drag.to > drag.from ? drag.to + 1 : drag.to) * h - 1}px`;
      spacer.append(mark);
    }
    if (focused?.key && focused.cls) spacer.querySelector(`[data-key="${focused.key}"] .${focused.cls}`)?.focus();
  }

  // --- dragging (mouse, pen and touch alike) -------------------------------------------------------
  function dropIndex(clientY) {
    const box = viewport.getBoundingClientRect();
    const y = clientY - box.top + viewport.scrollTop;
    return Math.min(model.items.length - 1, Math.max(0, Math.floor(y / rowHeight())));
  }
  function startDrag(event, key, index) {
    if (event.button !== 0) return;
    event.preventDefault();
    drag.key = key;
    drag.from = index;
    drag.to = index;
    drag.pointer = event.pointerId;
    panel.dataset.dragging = "true";
    draw();
  }
  function dragMove(event) {
    if (drag.key === null || event.pointerId !== drag.pointer) return;
    event.preventDefault();
    const box = viewport.getBoundingClientRect();
    // Near an edge the list scrolls.
    if (event.clientY < box.top + 24) viewport.scrollTop -= rowHeight() / 2;
    else if (event.clientY > box.bottom - 24) viewport.scrollTop += rowHeight() / 2;
    const to = dropIndex(event.clientY);
    if (to !== drag.to) {
      drag.to = to;
      draw();
    }
  }
  function dragEnd(event) {
    if (drag.key === null || event.pointerId !== drag.pointer) return;
    const from = model.items.findIndex((i) => i.key === drag.key);
    const to = event.type === "pointerup" ? dropIndex(event.clientY) : from;
    drag.key = null;
    drag.to = -1;
    delete panel.dataset.dragging;
    if (from >= 0 && to !== from) move(from, to);
    else draw();
  }
  window.addEventListener("pointermove", dragMove, { passive: false });
  window.addEventListener("pointerup", dragEnd);
  window.addEventListener("pointercancel", dragEnd);

  function openPanel(open) {
    panel.hidden = !open;
    $("queue-toggle").setAttribute("aria-expanded", String(open));
    document.body.dataset.queue = open ? "open" : "closed";
    if (open) {
      draw();
      scrollToCurrent();
      $("queue-close").focus();
    }
  }

  // --- player bar: shuffle, repeat, the panel's button ------------------------------------------
  function showModes() {
    const shuffle = $("shuffle");
    shuffle.setAttribute("aria-pressed", String(model.shuffle));
    shuffle.textContent = labels.shuffle;
    shuffle.title = labels.shuffle;
    const repeat = $("repeat");
    repeat.dataset.repeat = model.repeat;
    const words = { off: labels.repeatOff, one: labels.repeatOne, all: labels.repeatAll }[model.repeat];
    repeat.textContent = words;
    repeat.title = words;
    repeat.setAttribute("aria-pressed", String(model.repeat !== "off"));
  }
  $("shuffle").addEventListener("click", () => {
    model.setShuffle(!model.shuffle);
    showModes();
    changed();
  });
  $("repeat").addEventListener("click", () => {
    model.setRepeat(REPEAT_MODES[(REPEAT_MODES.indexOf(model.repeat) + 1) % REPEAT_MODES.length]);
    showModes();
    changed();
  });
  $("queue-toggle").addEventListener("click", () => openPanel(panel.hidden));
  $("queue-close").addEventListener("click", () => {
    openPanel(false);
    $("queue-toggle").focus();
  });
  $("queue-clear").addEventListener("click", clear);
  panel.addEventListener("keydown", (event) => {
    if (event.key !== "Escape") return;
    event.preventDefault();
    openPanel(false);
    $("queue-toggle").focus();
  });
  viewport.addEventListener("scroll", () => requestAnimationFrame(draw), { passive: true });
  window.addEventListener("resize", () => draw());

  // The time in the item and the volume, kept as they change (the time at most once a second).
  audio.addEventListener("timeupdate", () => {
    if (Date.now() - lastTimeSave > 1000) savePlayer();
  });
  for (const name of ["seeked", "playing"]) audio.addEventListener(name, () => { restoredTime = null; });
  for (const name of ["pause", "seeked", "volumechange"]) audio.addEventListener(name, savePlayer);
  window.addEventListener("pagehide", () => {
    if (saveTimer) saveQueue();
    savePlayer();
  });

  // --- the track list's hooks (listen.js) -----------------------------------------------------------
  const allNext = iconButton("queue-all-next", labels.playNext, () => {
    const list = player?.list();
    if (list) enqueue(list.tracks, list.node, 0, "next");
  });
  const allAdd = iconButton("queue-all-add", labels.addToQueue, () => {
    const list = player?.list();
    if (list) enqueue(list.tracks, list.node, 0, "add");
  });
  allNext.textContent = labels.playNext;
  allAdd.textContent = labels.addToQueue;
  // Their names are the words they show; the whole sentence is their description.
  allNext.removeAttribute("aria-label");
  allAdd.removeAttribute("aria-label");
  allNext.title = labels.playAllNext;
  allAdd.title = labels.addAllToQueue;
  allNext.disabled = allAdd.disabled = true;
  $("play-all").after(allNext, allAdd);

  function decorateRow(row, track, index, node) {
    if (!queueItem(track, node, index)) return;
    const tools = document.createElement("span");
    tools.className = "queue-tools";
    const title = String(track.title ?? "");
    const next = iconButton("queue-next", labels.playNext, () => enqueue([track], node, index, "next"));
    const add = iconButton("queue-add", labels.addToQueue, () => enqueue([track], node, index, "add"));
    next.setAttribute("aria-label", `${labels.playNext}: ${title}`);
    add.setAttribute("aria-label", `${labels.addToQueue}: ${title}`);
    tools.append(next, add);
    row.classList.add("with-queue");
    row.append(tools);
  }
  function listed(list) {
    allNext.disabled = allAdd.disabled = list.tracks.length === 0;
  }
  // Whether the row at `index` of the listed `node` is the playing item.
  function isPlaying(node, index, track) {
    const item = model.currentItem();
    return Boolean(item) && item.from === node && item.at === index && (item.stream ?? item.url) === (track?.stream ?? track?.url);
  }

  // Puts back the queue and the player as they were: paused, at the saved time, never playing.
  function restore() {
    const loaded = model.load(readStorage(QUEUE_KEY));
    const state = readPlayerState(readStorage(PLAYER_KEY));
    audio.volume = state.volume;
    $("volume").value = String(Math.round(state.volume * 100));
    showModes();
    const item = loaded ? model.currentItem() : null;
    if (item && player) {
      restoredTime = state.time;
      player.load(item, { autoplay: false, time: state.time });
    }
    draw();
    player?.redraw();
  }

  showModes();
  $("queue-toggle").textContent = labels.queue;
  $("queue-toggle").title = labels.queue;
  $("queue-title").textContent = labels.queue;
  $("queue-clear").textContent = labels.queueClear;
  $("queue-close").textContent = labels.queueClose;
  $("queue-close").setAttribute("aria-label", labels.queueClose);
  $("queue-empty").textContent = labels.queueEmpty;
  viewport.setAttribute("aria-label", labels.queue);
  draw();

  return {
    attach: (p) => { player = p; },
    replace, step, ended, decorateRow, listed, isPlaying, restore,
    model, // the state, for the Media Session and the tests of the page
    hasItems: () => model.items.length > 0,
  };
}
