// The right-hand pane: what the selected node holds (from webapi/library.cgi) and the player.
// A list of any length is drawn as a window of rows over a spacer of its full height: only the
// rows in view (and a few around them) exist in the document, so 10,000 tracks scroll smoothly.
const API = "webapi/library.cgi";
const ROW_HEIGHT = 28; // px; .track in app.css has the same height
const OVERSCAN = 8;    // rows drawn above and below the visible ones

// Which tree nodes hold tracks or containers that the API lists.
export function isListable(id) {
  if (typeof id !== "string") return false;
  if (id.startsWith("mediaserver_")) return id !== "mediaserver_root" && id !== "mediaserver_refresh";
  if (/^inetradio_(userdefined|favorite|sc|rio)$/.test(id)) return true;
  if (!id.startsWith("musiclib_") || id === "musiclib_root") return false;
  if (/^musiclib_music_(personal|shared)/.test(id)) return /^musiclib_music_(personal|shared)\/playlist\//.test(id);
  return true;
}

export function formatDuration(seconds) {
  if (!Number.isFinite(seconds) || seconds < 0) return "";
  const s = Math.floor(seconds);
  return `${Math.floor(s / 60)}:${String(s % 60).padStart(2, "0")}`;
}

const $ = (id) => document.getElementById(id);

export function createListener({ labels, onFailure, onStatus }) {
  const state = {
    list: { node: "", containers: [], tracks: [] }, // what the pane shows
    queue: [],          // the tracks being played, in order
    queueNode: "",      // the node the queue came from
    index: -1,          // the playing track in the queue
    request: 0,         // the newest list request; older replies are dropped
  };
  const audio = $("audio");
  const viewport = $("tracks");
  const spacer = $("tracks-spacer");

  // `object`: a container of a media server on the network (its root when absent).
  async function fetchList(node, object) {
    const params = { action: "list", node };
    if (typeof object === "string") params.object = object;
    let response;
    try {
      response = await fetch(`${API}?${new URLSearchParams(params)}`, {
        credentials: "same-origin",
        cache: "no-store",
      });
    } catch {
      return { kind: "offline" };
    }
    let body = null;
    try {
      body = await response.json();
    } catch {
      // below
    }
    if (response.ok && body && body.success === true) return { kind: "list", body };
    if (body && body.errinfo) return { kind: "error", errinfo: body.errinfo, message: body.message, code: body.error, status: response.status };
    return { kind: "http", status: response.status };
  }

  async function show(node, title, object) {
    const request = ++state.request;
    $("listing").hidden = false;
    $("listing").setAttribute("aria-busy", "true");
    $("list-title").textContent = title;
    const reply = await fetchList(node, object);
    if (request !== state.request) return;
    $("listing").removeAttribute("aria-busy");
    if (reply.kind !== "list") {
      setList({ node, containers: [], tracks: [] });
      onFailure(reply);
      return;
    }
    const tracks = Array.isArray(reply.body.tracks) ? reply.body.tracks : [];
    const containers = Array.isArray(reply.body.containers) ? reply.body.containers : [];
    setList({ node, containers, tracks });
    $("listing").dataset.node = node;
    $("listing").dataset.loaded = String(Number($("listing").dataset.loaded ?? 0) + 1);
  }

  function hide() {
    state.request += 1;
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
        button.addEventListener("click", () => show(String(c.node), String(c.title ?? ""), object));
        li.append(button);
        return li;
      }),
    );
    containers.hidden = list.containers.length === 0;
    $("list-count").textContent = labels.trackCount.replace("{count}", String(list.tracks.length));
    $("play-all").disabled = list.tracks.length === 0;
    spacer.style.height = `${list.tracks.length * ROW_HEIGHT}px`;
    viewport.hidden = list.tracks.length === 0;
    viewport.scrollTop = 0;
    viewport.setAttribute("aria-rowcount", String(list.tracks.length));
    drawRows();
  }

  // Draws the rows that the viewport shows, reusing nothing: a window is at most a few dozen rows.
  function drawRows() {
    const tracks = state.list.tracks;
    const first = Math.max(0, Math.floor(viewport.scrollTop / ROW_HEIGHT) - OVERSCAN);
    const visible = Math.ceil((viewport.clientHeight || 400) / ROW_HEIGHT) + 2 * OVERSCAN;
    const last = Math.min(tracks.length, first + visible);
    const rows = [];
    for (let i = first; i < last; i++) rows.push(trackRow(tracks[i], i));
    spacer.replaceChildren(...rows);
  }

  function trackRow(track, index) {
    const row = document.createElement("div");
    row.className = "track";
    row.setAttribute("role", "row");
    row.setAttribute("aria-rowindex", String(index + 1));
    row.dataset.index = String(index);
    row.dataset.stream = String(track.stream ?? "");
    row.style.top = `${index * ROW_HEIGHT}px`;
    if (isPlaying(index)) row.classList.add("playing");
    for (const [name, text] of [
      ["number", String(index + 1)],
      ["title", track.title],
      ["artist", track.artist],
      ["album", track.album],
      ["duration", formatDuration(track.duration)],
    ]) {
      const cell = document.createElement("span");
      cell.className = name;
      cell.textContent = String(text ?? "");
      row.append(cell);
    }
    row.title = String(track.title ?? "");
    return row;
  }

  function isPlaying(index) {
    return state.queueNode === state.list.node && state.index === index && state.queue === state.list.tracks;
  }

  function play(tracks, node, index) {
    state.queue = tracks;
    state.queueNode = node;
    state.index = index;
    const track = tracks[index];
    if (!track) return;
    // A row that is not a library track (a station, another server's track) names its own URL.
    audio.src = typeof track.url === "string" && track.url !== "" ? track.url : `media/${encodeURIComponent(String(track.stream))}`;
    audio.play().catch(() => {
      // a play() superseded by the next one, or refused: the audio element's events say so
    });
    $("now-playing").textContent = [track.title, track.artist].filter(Boolean).join(" — ");
    $("player").dataset.stream = String(track.stream ?? track.url);
    $("player").dataset.index = String(index);
    drawRows();
  }

  function step(delta) {
    const next = state.index + delta;
    if (next >= 0 && next < state.queue.length) play(state.queue, state.queueNode, next);
  }

  function updateTime() {
    const duration = Number.isFinite(audio.duration) ? audio.duration : 0;
    $("time").textContent = `${formatDuration(audio.currentTime)} / ${formatDuration(duration)}`;
    if (!$("seek").matches(":active")) $("seek").value = duration > 0 ? String(Math.round((audio.currentTime / duration) * 1000)) : "0";
  }

  viewport.addEventListener("scroll", () => requestAnimationFrame(drawRows), { passive: true });
  window.addEventListener("resize", drawRows);
  spacer.addEventListener("click", (event) => {
    const row = event.target.closest(".track");
    if (row) play(state.list.tracks, state.list.node, Number(row.dataset.index));
  });
  $("play-all").addEventListener("click", () => play(state.list.tracks, state.list.node, 0));
  $("prev").addEventListener("click", () => step(-1));
  $("next").addEventListener("click", () => step(1));
  $("play").addEventListener("click", () => {
    if (!audio.src) {
      if (state.list.tracks.length > 0) play(state.list.tracks, state.list.node, 0);
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
    step(1);
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

  return { show, hide };
}
