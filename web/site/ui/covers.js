// Cover art on the page: the albums of a node as a grid of covers (year and track count under
// each), an album artist's albums with all its tracks (so that "Play all" plays them), a cover in
// every track row and beside the track that plays. The images are "media/art/<track id>.<jpg|png>"
// as library.cgi names them (the web server passes them to the local media server behind the same
// login; the browser keeps them, so a reload does not fetch them again); a track or an album
// without a cover shows a neutral placeholder, never a broken image. Only covers that exist are
// requested.
import { counted } from "./text.js";
import { askLibrary } from "./library.js";
const BATCH = 200; // stream ids per covers request (library.cgi's bound)

// The nodes whose containers are albums, and what library.cgi's albums action answers for them.
const ALBUM_VIEWS = new Set(["musiclib_music_album", "musiclib_music_latestalbum"]);
const ARTIST_NODE = /^musiclib_artist:[^/]+$/;
export function isAlbumView(node) {
  return typeof node === "string" && (ALBUM_VIEWS.has(node) || ARTIST_NODE.test(node));
}
export function isArtistNode(node) {
  return typeof node === "string" && ARTIST_NODE.test(node);
}

// A cover path from library.cgi, checked: only the form it answers is ever put into a src.
const COVER_PATH = /^media\/art\/[0-9]{1,18}\.(jpg|png)$/;
export function checkedCover(path) {
  return typeof path === "string" && COVER_PATH.test(path) ? path : null;
}

// library.cgi's answer, or null when there is none to draw from (the covers stay placeholders).
async function getJson(params, signal) {
  const reply = await askLibrary(params, { signal });
  return reply.kind === "ok" ? reply.body : null;
}

// A cover image, or the placeholder when `path` is null. `size`: a class for the size.
export function coverElement(path, size) {
  const checked = checkedCover(path);
  if (!checked) {
    const placeholder = document.createElement("span");
    placeholder.className = `cover-image cover-placeholder ${size}`;
    placeholder.setAttribute("aria-hidden", "true");
    return placeholder;
  }
  const img = document.createElement("img");
  img.className = `cover-image ${size}`;
  img.alt = "";
  img.decoding = "async";
  img.loading = "lazy";
  img.src = checked;
  // An image that cannot be shown after all (removed since the listing) gives way to the
  // placeholder.
  img.addEventListener("error", () => img.replaceWith(coverElement(null, size)), { once: true });
  return img;
}

export function createCovers({ labels }) {
  const known = new Map(); // stream id -> cover path or null
  const waiting = new Map(); // stream id -> [resolve] of coverUrl calls
  let queued = new Set();
  let timer = 0;

  async function flush() {
    timer = 0;
    const streams = [...queued];
    queued = new Set();
    for (let i = 0; i < streams.length; i += BATCH) {
      const part = streams.slice(i, i + BATCH);
      const body = await getJson({ action: "covers", streams: part.join(",") });
      for (const stream of part) {
        const path = checkedCover(body?.covers?.[stream]);
        // A failed request is not remembered: the next drawing asks again.
        if (body) known.set(stream, path);
        for (const resolve of waiting.get(stream) ?? []) resolve(path);
        waiting.delete(stream);
        if (body) fillRows(stream, path);
      }
    }
  }
  function lookUp(stream) {
    queued.add(stream);
    if (!timer) timer = setTimeout(flush, 30);
  }

  // The rows on screen of `stream` get its cover.
  function fillRows(stream, path) {
    for (const cell of document.querySelectorAll("#tracks .track > .cover")) {
      if (cell.parentElement.dataset.stream === stream && cell.dataset.state !== "known") setCell(cell, path);
    }
    const now = document.getElementById("now-cover");
    if (now && now.dataset.stream === stream) setNowCover(stream, path);
  }
  function setCell(cell, path) {
    cell.replaceChildren(coverElement(path, "cover-row"));
    cell.dataset.state = "known";
  }

  // The cover path of a row (from the list itself, or asked for); undefined while unknown.
  function pathOf(track) {
    if (typeof track?.stream !== "string" || track.stream === "") return null; // a station, a remote track
    if ("cover" in track) return checkedCover(track.cover);
    return known.get(track.stream);
  }

  // The listing's hook for each drawn row: a cover cell after the number.
  function decorateRow(row, track) {
    const cell = document.createElement("span");
    cell.className = "cover";
    row.classList.add("with-cover");
    const path = pathOf(track);
    if (path === undefined) {
      cell.replaceChildren(coverElement(null, "cover-row"));
      lookUp(track.stream);
    } else {
      setCell(cell, path);
    }
    const number = row.querySelector(":scope > .number");
    if (number) number.after(cell);
    else row.prepend(cell);
  }

  // The cover beside the player's title.
  function setNowCover(stream, path) {
    let holder = document.getElementById("now-cover");
    if (!holder) {
      holder = document.createElement("span");
      holder.id = "now-cover";
      holder.className = "now-cover";
      document.getElementById("now-playing").before(holder);
    }
    holder.dataset.stream = stream;
    holder.replaceChildren(coverElement(path, "cover-now"));
  }
  function playing(track) {
    const stream = typeof track?.stream === "string" ? track.stream : "";
    const path = pathOf(track);
    setNowCover(stream, path ?? null);
    if (path === undefined) lookUp(stream);
  }

  // The cover of a track as an absolute URL (for the Media Session's artwork), or null.
  async function coverUrl(track) {
    let path = pathOf(track);
    if (path === undefined) {
      path = await new Promise((resolve) => {
        waiting.set(track.stream, [...(waiting.get(track.stream) ?? []), resolve]);
        lookUp(track.stream);
      });
    }
    return path ? new URL(path, document.baseURI).href : null;
  }

  // The listing's hook before a list is drawn: an album view gets its albums' years, track counts
  // and covers, an album artist all its tracks.
  async function extendList(node, reply, signal) {
    if (reply.kind !== "list" || !isAlbumView(node)) return reply;
    const body = await getJson({ action: "albums", node }, signal);
    if (!body || !Array.isArray(body.albums)) return reply;
    const albums = new Map();
    for (const album of body.albums) if (typeof album?.node === "string") albums.set(album.node, album);
    const extended = { ...reply.body, albums };
    if (isArtistNode(node) && Array.isArray(body.tracks)) {
      extended.tracks = body.tracks;
      for (const track of body.tracks) if (typeof track?.stream === "string") known.set(track.stream, checkedCover(track.cover));
    }
    return { ...reply, body: extended };
  }

  // The listing's hook after the containers are drawn: the albums of an album view as a grid of
  // covers, each with its year and track count.
  function decorateContainers(list, albums) {
    const grid = isAlbumView(list.node);
    const element = document.getElementById("containers");
    element.classList.toggle("album-grid", grid);
    if (grid) element.setAttribute("aria-label", labels.coverAlbums);
    else element.removeAttribute("aria-label");
    if (!grid) return;
    for (const button of element.querySelectorAll("button.container")) {
      const album = albums?.get(button.dataset.node);
      const title = button.textContent;
      const name = document.createElement("span");
      name.className = "album-title";
      name.textContent = title;
      const facts = document.createElement("span");
      facts.className = "album-facts";
      const parts = [];
      if (album && typeof album.artist === "string" && album.artist !== "" && !isArtistNode(list.node)) parts.push(album.artist);
      if (album && Number.isInteger(album.year) && album.year > 0) parts.push(String(album.year));
      if (album && Number.isInteger(album.tracks)) parts.push(counted(labels, "coverTrackCount", album.tracks));
      facts.textContent = parts.join(" · ");
      button.classList.add("album-tile");
      button.replaceChildren(coverElement(album?.cover ?? null, "cover-tile"), name, facts);
      button.title = title;
    }
  }

  return { decorateRow, playing, coverUrl, extendList, decorateContainers };
}
