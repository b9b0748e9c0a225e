// The right-hand pane: what the selected node holds (from webapi/library.cgi) and the player.
// A list of any length is drawn as a window of rows over a spacer of its full height: only the
// rows in view (and a few around them) exist in the document, so 10,000 tracks scroll smoothly.
import { failureCode } from "./failures.js";
import { askLibrary } from "./library.js";
import { counted } from "./text.js";

const ROW_HEIGHT = 28; // px; .track in app.css has the same height (--track-height where a layout sets it)
const OVERSCAN = 8;    // rows drawn above and below the visible ones
// The list's columns: the class of their cells, the word of their header, how they sort.
export const COLUMNS = [
  { name: "number", word: "colNumber", sort: "number" },
  { name: "title", word: "colTitle", sort: "text" },
  { name: "artist", word: "colArtist", sort: "text" },
  { name: "album", word: "colAlbum", sort: "text" },
  { name: "duration", word: "colDuration", sort: "number" },
];

// The tracks in the order of a column (`direction` "ascending" or "descending"); the listing's own
// order for the number column. Equal values keep the listing's order; empty texts and unknown
// durations go last either way.
export function sortedTracks(tracks, column, direction, collator = new Intl.Collator()) {
  const indexed = tracks.map((track, index) => ({ track, index }));
  const sign = direction === "descending" ? -1 : 1;
  const key = (entry) => {
    if (column === "number") return entry.index;
    if (column === "duration") return Number.isFinite(entry.track.duration) && entry.track.duration >= 0 ? entry.track.duration : null;
    const text = entry.track[column];
    return typeof text === "string" && text !== "" ? text : null;
  };
  indexed.sort((a, b) => {
    const x = key(a);
    const y = key(b);
    if (x === null || y === null) return x === y ? a.index - b.index : x === null ? 1 : -1;
    const order = typeof x === "number" ? x - y : collator.compare(x, y);
    return order !== 0 ? sign * order : a.index - b.index;
  });
  return indexed.map((entry) => entry.track);
}

// Which tree nodes hold tracks or containers that the API lists.
export function isListable(id) {
  if (typeof id !== "string") return false;
  if (id.startsWith("mediaserver_")) return id !== "mediaserver_root" && id !== "mediaserver_refresh";
  if (/^inetradio_(userdefined|favorite|sc|rio)$/.test(id)) return true;
  if (!id.startsWith("musiclib_") || id === "musiclib_root") return false;
  if (/^musiclib_music_(personal|shared)/.test(id)) return /^musiclib_music_(personal|shared)\/(playlist|smart)\//.test(id);
  return true;
}

export function formatDuration(seconds) {
  if (!Number.isFinite(seconds) || seconds < 0) return "";
  const s = Math.floor(seconds);
  return `${Math.floor(s / 60)}:${String(s % 60).padStart(2, "0")}`;
}

const $ = (id) => document.getElementById(id);

// `decorateRow(row, track, index, node)` and `onListed(node, title, list)`: the playlist editor's
// hooks (playlists.js), called for each drawn row and after each listing. `queue`: the play queue
// (queue.js), which the player plays; without one the listed rows are played as they are.
// The cover art's hooks (covers.js): `extendList(node, reply, signal)` adds to a list before it is
// drawn, `decorateContainers(list, albums)` after its containers are drawn, `decorateCover(row,
// track)` for each drawn row, `onPlay(track)` when a track starts. `openContainer(node, title,
// object)`: what a click on a container of the list does (navigation, nav.js); lists it by default.
// `language`: the page's language, for the order of a sorted column.
export function createListener({ onPlayerLoad = () => {}, labels, language = "en", onFailure, onStatus, onSuccess = () => {}, begin = () => 0, drawRandom = async () => false, decorateRow = () => {}, onListed = () => {},
  extendList = async (node, reply) => reply, decorateContainers = () => {}, decorateCover = () => {}, onPlay = () => {}, openContainer = null, queue = null }) {
  const state = {
    list: { node: "", containers: [], tracks: [] }, // what the pane shows
    view: [],           // its tracks in the order shown (sorted by a column, or as listed)
    listed: new Map(),  // a track of the view -> its index in the listing's order
    sort: { column: "", direction: "" }, // the column the view is sorted by ("" for none)
    queue: [],          // the tracks being played, in order (no play queue given)
    queueNode: "",      // the node the queue came from
    index: -1,          // the playing track in the queue
    cursor: -1,         // the row that the keyboard is on
    request: 0,         // the newest list request; older replies are dropped
    abort: null,        // aborts the list request in flight
    pending: 0,         // a deferred show (keyboard moves through the tree)
  };
  const audio = $("audio");
  const viewport = $("tracks");
  const spacer = $("tracks-spacer");
  // The rows' height: the layout's (a phone's rows are taller), else ROW_HEIGHT.
  let rowHeight = ROW_HEIGHT;
  const measureRows = () => { rowHeight = Number.parseFloat(getComputedStyle(viewport).getPropertyValue("--track-height")) || ROW_HEIGHT; };
  measureRows();

  const collator = new Intl.Collator(language, { sensitivity: "base", numeric: true });

  // The column headers: a row of its own above the rows, each header a button that sorts.
  const head = document.createElement("div");
  head.className = "tracks-head";
  head.setAttribute("role", "rowgroup");
  const headRow = document.createElement("div");
  headRow.className = "track-head";
  headRow.setAttribute("role", "row");
  headRow.setAttribute("aria-rowindex", "1");
  for (const column of COLUMNS) {
    const header = document.createElement("div");
    header.className = column.name;
    header.setAttribute("role", "columnheader");
    header.dataset.column = column.name;
    const button = document.createElement("button");
    button.type = "button";
    button.className = "sort";
    button.tabIndex = -1; // the list is one tab stop: the headers are reached with the arrow keys
    button.textContent = labels[column.word];
    button.addEventListener("click", () => sortBy(column.name));
    header.append(button);
    headRow.append(header);
  }
  head.append(headRow);
  viewport.prepend(head);
  viewport.setAttribute("aria-label", labels.trackList);

  // `object`: a container of a media server on the network (its root when absent).
  async function fetchList(node, object, signal) {
    const params = { action: "list", node };
    if (typeof object === "string") params.object = object;
    const reply = await askLibrary(params, { signal });
    return reply.kind === "ok" ? { kind: "list", body: reply.body } : reply;
  }

  // The pane while a list loads, or after it failed: its title, the state in words, no rows.
  function showState(text, isError) {
    const line = $("list-state");
    line.textContent = text;
    line.hidden = text === "";
    line.classList.toggle("error", isError);
  }

  function cancel() {
    state.request += 1;
    clearTimeout(state.pending);
    if (state.abort) state.abort.abort();
    state.abort = null;
  }

  // Lists `node`; `defer` ms later when given (the pane shows the loading state at once).
  async function show(node, title, object, { defer = 0 } = {}) {
    cancel();
    const request = state.request;
    const ticket = begin();
    const listing = $("listing");
    listing.hidden = false;
    listing.setAttribute("aria-busy", "true");
    listing.dataset.state = "loading";
    delete listing.dataset.node;
    delete listing.dataset.error;
    $("list-title").textContent = title;
    setList({ node, containers: [], tracks: [] });
    $("list-count").textContent = "";
    showState(labels.listLoading, false);
    if (defer > 0) {
      await new Promise((resolve) => { state.pending = setTimeout(resolve, defer); });
      if (request !== state.request) return;
    }
    const controller = new AbortController();
    state.abort = controller;
    let reply = await fetchList(node, object, controller.signal);
    // The user's Random 100 before the first draw: drawn now, as "New Random 100" does.
    if (request === state.request && reply.kind === "list" && reply.body.drawn === false && (await drawRandom()))
      if (request === state.request) reply = await fetchList(node, object, controller.signal);
    if (request === state.request && reply.kind === "list") reply = await extendList(node, reply, controller.signal);
    if (request !== state.request || reply.kind === "aborted") return;
    state.abort = null;
    listing.removeAttribute("aria-busy");
    if (reply.kind !== "list") {
      listing.dataset.state = "failed";
      const code = failureCode(reply);
      if (code) listing.dataset.error = code;
      showState((code && labels.failures?.[code]) || reply.message || labels.badReply, true);
      onListed(node, title, state.list);
      queue?.listed(state.list);
      onFailure(reply, ticket, node);
      return;
    }
    const tracks = Array.isArray(reply.body.tracks) ? reply.body.tracks : [];
    const containers = Array.isArray(reply.body.containers) ? reply.body.containers : [];
    showState("", false);
    setList({ node, containers, tracks, albums: reply.body.albums });
    onListed(node, title, state.list);
    queue?.listed(state.list);
    listing.dataset.state = "loaded";
    listing.dataset.node = node;
    listing.dataset.loaded = String(Number(listing.dataset.loaded ?? 0) + 1);
    onSuccess(ticket, node);
  }

  // The list shown again, when it is `node` (after a new draw of it).
  function reload(node) {
    if (state.list.node === node && !$("listing").hidden) show(node, $("list-title").textContent);
  }

  function hide() {
    cancel();
    $("listing").hidden = true;
  }

  function setList(list) {
    state.list = list;
    const containers = $("containers");
    containers.replaceChildren(
      ...list.containers.map((c) => {
        const li = document.createElement("li");
        const button = document.createElement("button");
        button.type = "button";
        button.className = "container";
        button.textContent = String(c.title ?? "");
        button.dataset.node = String(c.node ?? "");
        const object = typeof c.object === "string" ? c.object : undefined;
        if (object !== undefined) button.dataset.object = object;
        button.addEventListener("click", () => (openContainer ?? show)(String(c.node), String(c.title ?? ""), object));
        li.append(button);
        return li;
      }),
    );
    containers.hidden = list.containers.length === 0;
    decorateContainers(list, list.albums);
    // A list of containers only (the album grid, an artist's albums) has no track count to show.
    const onlyContainers = list.tracks.length === 0 && list.containers.length > 0;
    $("list-count").textContent = onlyContainers ? "" : counted(labels, "trackCount", list.tracks.length);
    // Another node starts in its own order; the same one again (a reload) keeps the column.
    if (list.node !== state.sortedNode) state.sort = { column: "", direction: "" };
    state.sortedNode = list.node;
    arrange();
    state.cursor = -1;
    viewport.tabIndex = 0;
    $("play-all").disabled = list.tracks.length === 0;
    spacer.style.height = `${list.tracks.length * rowHeight}px`;
    viewport.hidden = list.tracks.length === 0;
    viewport.scrollTop = 0;
    viewport.setAttribute("aria-rowcount", String(list.tracks.length + 1));
    drawRows();
  }

  // The view: the listing's tracks in the order of the sorted column, and each one's listed index.
  function arrange() {
    const tracks = state.list.tracks;
    state.view = state.sort.column ? sortedTracks(tracks, state.sort.column, state.sort.direction, collator) : tracks;
    state.listed = new Map(tracks.map((track, index) => [track, index]));
    for (const header of head.querySelectorAll("[role=columnheader]")) {
      if (header.dataset.column === state.sort.column) header.setAttribute("aria-sort", state.sort.direction);
      else header.removeAttribute("aria-sort");
    }
  }

  // A click on a column's header: sorted by it, ascending, then descending, then as listed.
  function sortBy(column) {
    const { column: now, direction } = state.sort;
    if (now !== column) state.sort = { column, direction: "ascending" };
    else if (direction === "ascending") state.sort = { column, direction: "descending" };
    else state.sort = { column: "", direction: "" };
    const focused = state.view[state.cursor];
    arrange();
    state.cursor = focused ? state.view.indexOf(focused) : -1;
    drawRows();
  }

  // Draws the rows that the viewport shows, reusing nothing: a window is at most a few dozen rows.
  // The keyboard's row is drawn too when it is out of view, so that it keeps the focus.
  function drawRows() {
    const tracks = state.view;
    const first = Math.max(0, Math.floor(viewport.scrollTop / rowHeight) - OVERSCAN);
    const visible = Math.ceil((viewport.clientHeight || 400) / rowHeight) + 2 * OVERSCAN;
    const last = Math.min(tracks.length, first + visible);
    const hadFocus = spacer.contains(document.activeElement);
    const rows = [];
    if (state.cursor >= 0 && state.cursor < first && state.cursor < tracks.length) rows.push(trackRow(tracks[state.cursor], state.cursor));
    for (let i = first; i < last; i++) rows.push(trackRow(tracks[i], i));
    if (state.cursor >= last && state.cursor < tracks.length) rows.push(trackRow(tracks[state.cursor], state.cursor));
    spacer.replaceChildren(...rows);
    // The header has the rows' columns.
    for (const feature of ["with-cover", "with-tools", "with-queue"])
      headRow.classList.toggle(feature, spacer.querySelector(`.track.${feature}`) !== null);
    if (hadFocus) focusCursor();
  }

  // One row: a cell per column, then what the row hooks add (each a cell of its own). `index` is
  // the row's place in the view; the number cell and the hooks get its place in the listing.
  function trackRow(track, index) {
    const listed = state.listed.get(track) ?? index;
    const row = document.createElement("div");
    row.className = "track";
    row.setAttribute("role", "row");
    row.setAttribute("aria-rowindex", String(index + 2)); // the header row is the first
    row.tabIndex = index === state.cursor ? 0 : -1;
    row.dataset.index = String(index);
    row.dataset.stream = String(track.stream ?? "");
    row.style.top = `${index * rowHeight}px`;
    if (isPlaying(track, index)) {
      row.classList.add("playing");
      row.setAttribute("aria-current", "true");
    }
    if (index === state.cursor) {
      row.classList.add("cursor");
      row.id = "track-cursor";
    }
    for (const [name, text] of [
      ["number", String(listed + 1)],
      ["title", track.title],
      ["artist", track.artist],
      ["album", track.album],
      ["duration", formatDuration(track.duration)],
    ]) {
      const cell = document.createElement("span");
      cell.className = name;
      cell.setAttribute("role", "gridcell");
      cell.textContent = String(text ?? "");
      row.append(cell);
    }
    row.title = String(track.title ?? "");
    decorateCover(row, track);
    decorateRow(row, track, listed, state.list.node);
    queue?.decorateRow(row, track, index, state.list.node);
    for (const cell of row.children) if (!cell.hasAttribute("role")) cell.setAttribute("role", "gridcell");
    return row;
  }

  // Whether `track`, the row at `index` of the view, is the one playing.
  function isPlaying(track, index) {
    if (queue) return queue.isPlaying(state.list.node, index, track);
    return state.queueNode === state.list.node && state.index >= 0 && state.queue[state.index] === track;
  }

  function focusCursor() {
    const row = spacer.querySelector(".track.cursor");
    if (row && document.activeElement !== row) row.focus({ preventScroll: true });
  }

  function play(tracks, node, index) {
    if (queue) {
      queue.replace(tracks, node, index);
      return;
    }
    state.queue = tracks;
    state.queueNode = node;
    state.index = index;
    const track = tracks[index];
    if (!track) return;
    load(track, { autoplay: true });
    $("player").dataset.index = String(index);
  }

  // Puts `track` in the player; `autoplay` plays it, else it waits paused at `time` seconds.
  function load(track, { autoplay = true, time = 0 } = {}) {
    // A row that is not a library track (a station, another server's track) names its own URL.
    audio.preload = autoplay ? "auto" : "metadata";
    audio.src = typeof track.url === "string" && track.url !== "" ? track.url : `media/${encodeURIComponent(String(track.stream))}`;
    if (autoplay) {
      audio.play().catch(() => {
        // a play() superseded by the next one, or refused: the audio element's events say so
      });
    } else {
      $("player").dataset.state = "paused";
      $("play").textContent = labels.play;
      if (time > 0)
        audio.addEventListener("loadedmetadata", () => {
          if (audio.paused && audio.currentTime === 0) audio.currentTime = Math.min(time, Number.isFinite(audio.duration) ? audio.duration : time);
        }, { once: true });
    }
    $("now-playing").textContent = [track.title, track.artist].filter(Boolean).join(" — ");
    $("player").dataset.stream = String(track.stream ?? track.url);
    $("player").dataset.index = String(queue ? queue.model.position() : state.index);
    onPlay(track);
    drawRows();
    onPlayerLoad(track);
  }
  function stop() {
    audio.pause();
    audio.removeAttribute("src");
    audio.load();
    $("now-playing").textContent = "";
    delete $("player").dataset.stream;
    delete $("player").dataset.index;
    $("player").dataset.state = "stopped";
    $("time").textContent = "0:00 / 0:00";
    $("seek").value = "0";
    drawRows();
  }

  // The keyboard's row: the list's one tab stop, scrolled into view (below the column headers) and
  // focused.
  function moveCursor(index) {
    state.cursor = index;
    viewport.tabIndex = -1;
    const top = index * rowHeight;
    // The headers' height as drawn: a phone's line of sort buttons is taller than a desktop's row.
    const room = Math.max(rowHeight, viewport.clientHeight - head.offsetHeight);
    if (top < viewport.scrollTop) viewport.scrollTop = top;
    else if (top + rowHeight > viewport.scrollTop + room) viewport.scrollTop = top + rowHeight - room;
    drawRows();
    focusCursor();
  }

  function step(delta) {
    if (queue) return queue.step(delta);
    const next = state.index + delta;
    if (next >= 0 && next < state.queue.length) play(state.queue, state.queueNode, next);
  }

  function updateTime() {
    const duration = Number.isFinite(audio.duration) ? audio.duration : 0;
    $("time").textContent = `${formatDuration(audio.currentTime)} / ${formatDuration(duration)}`;
    if (!$("seek").matches(":active")) $("seek").value = duration > 0 ? String(Math.round((audio.currentTime / duration) * 1000)) : "0";
  }

  viewport.addEventListener("scroll", () => requestAnimationFrame(drawRows), { passive: true });
  window.addEventListener("resize", () => {
    measureRows();
    spacer.style.height = `${state.list.tracks.length * rowHeight}px`;
    drawRows();
  });
  spacer.addEventListener("click", (event) => {
    const row = event.target.closest(".track");
    if (!row) return;
    state.cursor = Number(row.dataset.index);
    viewport.tabIndex = -1;
    play(state.view, state.list.node, state.cursor);
    // A button of the row (a hook's) keeps the focus it took; a click elsewhere focuses the row.
    if (!event.target.closest("button")) focusCursor();
  });
  // "Play all": the list in the order shown from its first track, or (in shuffle) from any.
  $("play-all").addEventListener("click", () => {
    if (queue) queue.replace(state.view, state.list.node, -1);
    else play(state.view, state.list.node, 0);
  });
  // The keyboard in the list: the arrows, Page Up/Down, Home and End move over the rows (the focus
  // goes with them), Enter plays the row. Space is the page's play/pause (keys.js).
  viewport.addEventListener("keydown", (event) => {
    const count = state.view.length;
    if (count === 0 || event.altKey || event.metaKey) return;
    // The column headers: Left and Right move between them, Down goes back to the rows.
    if (head.contains(event.target)) {
      const buttons = [...head.querySelectorAll("button.sort")];
      const at = buttons.indexOf(event.target);
      if (event.key === "ArrowLeft" || event.key === "ArrowRight") buttons[Math.min(buttons.length - 1, Math.max(0, at + (event.key === "ArrowLeft" ? -1 : 1)))].focus();
      else if (event.key === "ArrowDown") moveCursor(Math.max(0, state.cursor));
      else return;
      event.preventDefault();
      return;
    }
    if (event.target !== viewport && !event.target.classList.contains("track")) return; // a hook's button
    // Up from the first row reaches the column headers.
    if (event.key === "ArrowUp" && state.cursor === 0) {
      head.querySelector(".title button.sort")?.focus();
      event.preventDefault();
      return;
    }
    const page = Math.max(1, Math.floor((viewport.clientHeight - head.offsetHeight) / rowHeight) - 1);
    const moves = { ArrowDown: 1, ArrowUp: -1, PageDown: page, PageUp: -page, Home: -count, End: count };
    if (event.key in moves) {
      moveCursor(Math.min(count - 1, Math.max(0, (state.cursor < 0 ? -1 : state.cursor) + moves[event.key])));
    } else if (event.key === "Enter" && state.cursor >= 0) {
      play(state.view, state.list.node, state.cursor);
    } else {
      return;
    }
    event.preventDefault();
  });
  $("prev").addEventListener("click", () => step(-1));
  $("next").addEventListener("click", () => step(1));
  $("play").addEventListener("click", () => {
    if (!audio.src) {
      if (queue?.hasItems()) queue.step(0);
      else if (state.view.length > 0) play(state.view, state.list.node, Math.max(0, state.cursor));
    } else if (audio.paused) {
      audio.play().catch(() => {});
    } else {
      audio.pause();
    }
  });
  $("seek").addEventListener("input", () => {
    if (Number.isFinite(audio.duration) && audio.duration > 0) audio.currentTime = (Number($("seek").value) / 1000) * audio.duration;
  });
  $("volume").addEventListener("input", () => {
    audio.volume = Math.min(1, Math.max(0, Number($("volume").value) / 100));
  });
  audio.addEventListener("timeupdate", updateTime);
  audio.addEventListener("durationchange", updateTime);
  audio.addEventListener("playing", () => {
    $("play").textContent = labels.pause;
    $("player").dataset.state = "playing";
  });
  audio.addEventListener("pause", () => {
    $("play").textContent = labels.play;
    $("player").dataset.state = "paused";
  });
  audio.addEventListener("ended", () => {
    $("player").dataset.state = "ended";
    if (queue) queue.ended();
    else step(1);
  });
  audio.addEventListener("error", () => {
    $("player").dataset.state = "error";
    onStatus(labels.cannotPlay, true);
  });

  $("play-all").textContent = labels.playAll;
  $("prev").textContent = labels.previous;
  $("next").textContent = labels.next;
  $("play").textContent = labels.play;
  $("seek").setAttribute("aria-label", labels.seek);
  $("volume").setAttribute("aria-label", labels.volume);

  // The player as the play queue drives it.
  // Its list is the one shown, in the order shown.
  const player = { load, stop, redraw: drawRows, list: () => ({ ...state.list, tracks: state.view }) };
  queue?.attach(player);
  // A list of rows found elsewhere (the search) played from one of them.
  const playTracks = (tracks, index) => play(tracks, "search", index);

  return { show, hide, reload, player, playTracks };
}
