// The search box in the header: finds tracks, albums and artists of the library as the user types
// (library.cgi?action=search), grouped in a list under the box. A track plays, an album or an
// artist opens in the pane. The keyboard: the arrows move from the box into the results and over
// them, Enter plays or opens the result, Escape clears the search.
import { failureCode } from "./failures.js";
import { askLibrary } from "./library.js";
import { formatDuration } from "./listen.js";
import { counted } from "./text.js";

// A keystroke after a pause sends its query at once; one that follows the one before within this
// pause waits for it, so that letters arriving together (a paste, key repeat, an input method) send
// one query for the whole text, not one per letter.
export const SEARCH_DEBOUNCE_MS = 30;
export const MAX_QUERY_BYTES = 200; // library.cgi refuses longer queries
export const MAX_QUERY_WORDS = 8;

// The words of what was typed, as library.cgi splits them (punctuation and spaces separate them).
export function queryWords(text) {
  return String(text ?? "").split(/[\x00-\x2f\x3a-\x40\x5b-\x60\x7b-\x7f]+/).filter((word) => word !== "");
}

// Whether `text` may be sent: within the server's bounds (longer text is cut by the box already).
export function isSendable(text) {
  const words = queryWords(text);
  return words.length > 0 && words.length <= MAX_QUERY_WORDS && new TextEncoder().encode(text).length <= MAX_QUERY_BYTES;
}

const $ = (id) => document.getElementById(id);

// `playTracks(tracks, index)` plays a list of track rows from one of them; `openNode(node, title)`
// lists a library node in the pane; `onFailure(reply)` says why a search failed.
export function createSearch({ labels, playTracks, openNode, onFailure = () => {} }) {
  const box = $("search");
  const panel = $("search-results");
  const state = {
    timer: 0,        // the pending send
    sent: 0,         // the number of the newest query sent; a reply of an older one never draws
    abort: null,     // aborts the query in flight
    lastInput: -Infinity, // when the text last changed (performance.now())
    options: [],     // the results in order: {element, activate}
    active: -1,      // the result the arrows are on (-1: the box)
  };

  box.placeholder = labels.searchPlaceholder;
  box.setAttribute("aria-label", labels.searchLabel);
  panel.setAttribute("aria-label", labels.searchResults);

  function close() {
    panel.hidden = true;
    box.setAttribute("aria-expanded", "false");
    box.removeAttribute("aria-activedescendant");
    state.active = -1;
  }

  function clear() {
    clearTimeout(state.timer);
    state.sent += 1;
    if (state.abort) state.abort.abort();
    state.abort = null;
    box.value = "";
    panel.replaceChildren();
    state.options = [];
    delete panel.dataset.query;
    panel.dataset.state = "idle";
    close();
  }

  function setActive(index) {
    state.options[state.active]?.element.classList.remove("active");
    state.options[state.active]?.element.setAttribute("aria-selected", "false");
    state.active = index;
    const option = state.options[index];
    if (!option) {
      box.removeAttribute("aria-activedescendant");
      return;
    }
    option.element.classList.add("active");
    option.element.setAttribute("aria-selected", "true");
    box.setAttribute("aria-activedescendant", option.element.id);
    option.element.scrollIntoView({ block: "nearest" });
  }

  function option(kind, main, detail, activate) {
    const element = document.createElement("li");
    element.id = `search-option-${state.options.length}`;
    element.className = "search-option";
    element.setAttribute("role", "option");
    element.setAttribute("aria-selected", "false");
    element.dataset.kind = kind;
    const title = document.createElement("span");
    title.className = "search-main";
    title.textContent = main;
    const more = document.createElement("span");
    more.className = "search-detail";
    more.textContent = detail;
    element.append(title, more);
    const entry = { element, activate };
    element.addEventListener("mousedown", (event) => event.preventDefault()); // the box keeps focus
    element.addEventListener("click", () => run(entry));
    state.options.push(entry);
    return element;
  }

  function group(id, heading, elements, more) {
    const list = document.createElement("ul");
    list.setAttribute("role", "group");
    list.className = "search-group";
    list.dataset.group = id;
    const label = document.createElement("li");
    label.id = `search-group-${id}`;
    label.className = "search-heading";
    label.setAttribute("role", "presentation");
    label.textContent = heading;
    list.setAttribute("aria-labelledby", label.id);
    list.append(label, ...elements);
    if (more) {
      const note = document.createElement("li");
      note.className = "search-more";
      note.setAttribute("role", "presentation");
      note.textContent = labels.searchMore;
      list.append(note);
    }
    return list;
  }

  function run(entry) {
    entry.activate();
    close();
  }

  function draw(query, body) {
    const tracks = Array.isArray(body.tracks) ? body.tracks : [];
    const albums = Array.isArray(body.albums) ? body.albums : [];
    const artists = Array.isArray(body.artists) ? body.artists : [];
    const more = body.more && typeof body.more === "object" ? body.more : {};
    state.options = [];
    state.active = -1;
    box.removeAttribute("aria-activedescendant");
    const groups = [];
    if (tracks.length > 0)
      groups.push(group("tracks", labels.searchTracks, tracks.map((track, index) =>
        option("track", String(track.title ?? ""), [track.artist, track.album, formatDuration(track.duration)].filter(Boolean).join(" · "),
          () => playTracks(tracks, index))), more.tracks === true));
    if (albums.length > 0)
      groups.push(group("albums", labels.searchAlbums, albums.map((album) =>
        option("album", String(album.title ?? ""), [album.artist, counted(labels, "searchTrackCount", Number(album.tracks ?? 0))].filter(Boolean).join(" · "),
          () => openNode(String(album.node), String(album.title ?? "")))), more.albums === true));
    if (artists.length > 0)
      groups.push(group("artists", labels.searchArtists, artists.map((artist) =>
        option("artist", String(artist.title ?? ""), counted(labels, "searchAlbumCount", Number(artist.albums ?? 0)),
          () => openNode(String(artist.node), String(artist.title ?? "")))), more.artists === true));
    if (groups.length === 0) {
      const none = document.createElement("div");
      none.className = "search-none";
      none.setAttribute("role", "presentation");
      none.textContent = labels.searchNone;
      groups.push(none);
    }
    panel.replaceChildren(...groups);
    panel.dataset.query = query;
    panel.dataset.state = "done";
    panel.dataset.drawn = String(Number(panel.dataset.drawn ?? 0) + 1);
    panel.hidden = false;
    box.setAttribute("aria-expanded", "true");
  }

  function showProblem(query, text) {
    const line = document.createElement("div");
    line.className = "search-none error";
    line.setAttribute("role", "presentation");
    line.textContent = text;
    state.options = [];
    state.active = -1;
    panel.replaceChildren(line);
    panel.dataset.query = query;
    panel.dataset.state = "failed";
    panel.hidden = false;
    box.setAttribute("aria-expanded", "true");
  }

  async function send(query) {
    const number = ++state.sent;
    if (state.abort) state.abort.abort();
    const controller = new AbortController();
    state.abort = controller;
    panel.dataset.state = "searching";
    const reply = await askLibrary({ action: "search", q: query }, { signal: controller.signal });
    if (reply.kind === "aborted" || number !== state.sent) return; // a newer query was typed meanwhile
    state.abort = null;
    if (reply.kind === "ok") {
      draw(query, reply.body);
      return;
    }
    const code = failureCode(reply);
    showProblem(query, (code && labels.failures?.[code]) || reply.message || labels.badReply);
    onFailure(reply);
  }

  function typed() {
    clearTimeout(state.timer);
    const query = box.value;
    if (!isSendable(query)) {
      state.sent += 1; // what is in flight is for an older text
      if (state.abort) state.abort.abort();
      state.abort = null;
      panel.replaceChildren();
      state.options = [];
      delete panel.dataset.query;
      if (queryWords(query).length > 0) showProblem(query, labels.searchTooLong);
      else close();
      panel.dataset.state = queryWords(query).length > 0 ? "refused" : "idle";
      return;
    }
    const now = performance.now();
    const together = now - state.lastInput < SEARCH_DEBOUNCE_MS;
    state.lastInput = now;
    if (together) state.timer = setTimeout(() => send(query), SEARCH_DEBOUNCE_MS);
    else send(query);
  }

  box.addEventListener("input", typed);
  box.addEventListener("keydown", (event) => {
    const count = state.options.length;
    if (event.key === "Escape") {
      if (box.value === "" && panel.hidden) return;
      clear();
    } else if (event.key === "ArrowDown" && count > 0) {
      if (panel.hidden) {
        panel.hidden = false;
        box.setAttribute("aria-expanded", "true");
      }
      setActive(Math.min(count - 1, state.active + 1));
    } else if (event.key === "ArrowUp" && count > 0 && !panel.hidden) {
      setActive(state.active - 1); // from the first result back to the box
    } else if (event.key === "Home" && state.active >= 0) {
      setActive(0);
    } else if (event.key === "End" && state.active >= 0) {
      setActive(count - 1);
    } else if (event.key === "Enter") {
      const entry = state.options[state.active >= 0 ? state.active : 0];
      if (!entry || panel.hidden) return;
      run(entry);
    } else {
      return;
    }
    event.preventDefault();
  });
  box.addEventListener("blur", () => setTimeout(() => { if (document.activeElement !== box) close(); }, 150));
  box.addEventListener("focus", () => {
    if (state.options.length > 0 || panel.dataset.state === "failed") {
      panel.hidden = false;
      box.setAttribute("aria-expanded", "true");
    }
  });
  panel.dataset.state = "idle";
  return { clear };
}
