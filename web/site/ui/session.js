// The Media Session: what plays, for the system's media controls (a phone's lock screen, a
// keyboard's media keys, a headset's buttons), and what those controls do: play, pause, the next
// and the previous item of the queue, and seeking.
const SEEK_STEP = 10; // seconds for seekbackward / seekforward when the control names none

// The artwork of an item: `coverUrl(item)` names its image (or nothing).
export function sessionMetadata(item, coverUrl = () => "") {
  const src = item ? coverUrl(item) : "";
  return {
    title: String(item?.title ?? ""),
    artist: String(item?.artist ?? ""),
    album: String(item?.album ?? ""),
    artwork: typeof src === "string" && src !== "" ? [{ src }] : [],
  };
}

// `audio`: the player's audio element; `queue`: the play queue (queue.js); `coverUrl(item)`: the
// URL of an item's cover when the page has one, or a promise of it.
export function createSession({ audio, queue, coverUrl = () => "" }) {
  const session = typeof navigator !== "undefined" ? navigator.mediaSession : undefined;
  if (!session) return { loaded: () => {} };

  const handlers = {
    play: () => {
      if (!audio.getAttribute("src")) queue.step(0);
      else audio.play().catch(() => {});
    },
    pause: () => audio.pause(),
    nexttrack: () => queue.step(1),
    previoustrack: () => queue.step(-1),
    seekto: (details) => {
      if (!Number.isFinite(details?.seekTime)) return;
      const time = Math.max(0, Math.min(details.seekTime, Number.isFinite(audio.duration) ? audio.duration : details.seekTime));
      if (details.fastSeek && typeof audio.fastSeek === "function") audio.fastSeek(time);
      else audio.currentTime = time;
    },
    seekbackward: (details) => {
      const offset = Number.isFinite(details?.seekOffset) ? details.seekOffset : SEEK_STEP;
      audio.currentTime = Math.max(0, audio.currentTime - offset);
    },
    seekforward: (details) => {
      const offset = Number.isFinite(details?.seekOffset) ? details.seekOffset : SEEK_STEP;
      const end = Number.isFinite(audio.duration) ? audio.duration : Infinity;
      audio.currentTime = Math.min(end, audio.currentTime + offset);
    },
  };
  for (const [action, handler] of Object.entries(handlers)) {
    try {
      session.setActionHandler(action, handler);
    } catch {
      // an action this browser does not know
    }
  }

  function position() {
    if (typeof session.setPositionState !== "function") return;
    const duration = audio.duration;
    try {
      if (Number.isFinite(duration) && duration > 0)
        session.setPositionState({ duration, position: Math.min(audio.currentTime, duration), playbackRate: audio.playbackRate || 1 });
      else session.setPositionState();
    } catch {
      // a state the browser refuses (a live stream's)
    }
  }
  audio.addEventListener("playing", () => { session.playbackState = "playing"; position(); });
  audio.addEventListener("pause", () => { session.playbackState = "paused"; position(); });
  audio.addEventListener("emptied", () => { session.playbackState = "none"; });
  for (const name of ["durationchange", "seeked", "ratechange"]) audio.addEventListener(name, position);

  // An item was put in the player. Its cover may be known only later (`coverUrl` may answer a
  // promise): the metadata is set at once without it, then again with it while the item still plays.
  let current = null;
  function show(item, src) {
    try {
      session.metadata = new MediaMetadata(sessionMetadata(item, () => src));
    } catch {
      session.metadata = null;
    }
  }
  function loaded(item) {
    current = item;
    const src = item ? coverUrl(item) : "";
    if (src && typeof src.then === "function") {
      show(item, "");
      src.then((url) => { if (current === item && url) show(item, url); }, () => {});
    } else {
      show(item, src);
    }
  }
  return { loaded };
}
