// Internet radio in the pane: the user's own stations ("User Defined") and favourites, listed by
// webapi/library.cgi and played by the pane's player straight from the station (each row's "url");
// a form to add a station, and per station a favourite mark and a remove button. A station
// directory's rows come from library.cgi too and play through its tune-in (each row's "url"); when a
// directory has no list (not set up, out of reach, an unreadable reply) the pane's notice says why.
import { askLibrary, tellLibrary } from "./library.js";

const USER_DEFINED = "inetradio_userdefined";
const FAVORITES = "inetradio_favorite";
const DIRECTORIES = new Set(["inetradio_sc", "inetradio_rio"]);
const ADD_BUTTON = "inetradio_new";

const $ = (id) => document.getElementById(id);

// The node whose list the pane shows for a tree node: the "Add Radio Station" button opens the
// user's own stations with the form.
export function listedRadioNode(id) {
  return id === ADD_BUTTON ? USER_DEFINED : id;
}

export function isRadioNode(id) {
  return id === USER_DEFINED || id === FAVORITES || DIRECTORIES.has(id);
}

// The words for an error code of a radio action or listing, or null.
export function radioErrorWords(labels, code) {
  if (typeof code !== "string" || !/^[a-z_]{1,40}$/.test(code)) return null;
  if (code === "directory_unreachable") return labels.radioDirectoryUnreachable;
  return labels[`radio_${code}`] ?? null;
}

export function createRadio({ labels, listener, showStatus, showFailure }) {
  const panel = $("radio-panel");
  const notice = $("radio-notice");
  const form = $("radio-form");
  const nameInput = $("radio-name");
  const urlInput = $("radio-url");
  const stationList = $("radio-stations");
  let current = null; // the radio node the pane shows
  let title = "";
  let generation = 0; // the newest station list request

  nameInput.placeholder = labels.radioName;
  nameInput.setAttribute("aria-label", labels.radioName);
  urlInput.placeholder = labels.radioUrl;
  urlInput.setAttribute("aria-label", labels.radioUrl);
  $("radio-add").textContent = labels.radioAdd;

  function say(text) {
    notice.textContent = text;
    notice.hidden = text === "";
  }


  // A failed change: the words for its code, else what the page says of any failure.
  function failed(reply) {
    const words = reply.kind === "error" ? radioErrorWords(labels, reply.code) : null;
    if (words) showStatus(words, true);
    else showFailure(reply);
  }

  function stationItem(station) {
    const li = document.createElement("li");
    li.dataset.station = String(station.station ?? "");
    const name = document.createElement("span");
    name.className = "radio-station-name";
    name.textContent = String(station.title ?? "");
    name.title = String(station.url ?? "");
    const favorite = document.createElement("button");
    favorite.type = "button";
    favorite.className = "radio-favorite";
    favorite.textContent = `${station.favorite === true ? "\u2605" : "\u2606"} ${labels.radioFavorite}`;
    favorite.setAttribute("aria-pressed", String(station.favorite === true));
    favorite.addEventListener("click", () => mark(station, station.favorite !== true));
    const remove = document.createElement("button");
    remove.type = "button";
    remove.className = "radio-remove";
    remove.textContent = labels.radioRemove;
    remove.addEventListener("click", () => removeStation(station));
    li.append(name, favorite, remove);
    return li;
  }

  async function refreshStations() {
    const asked = ++generation;
    const node = current;
    const reply = await askLibrary({ action: "list", node });
    if (asked !== generation || node !== current) return;
    const stations = reply.kind === "ok" && Array.isArray(reply.body.tracks) ? reply.body.tracks : [];
    stationList.replaceChildren(...stations.map(stationItem));
    stationList.hidden = stations.length === 0;
    if (reply.kind === "ok" && stations.length === 0) say(node === FAVORITES ? labels.radioNoFavorites : labels.radioNone);
    else if (reply.kind === "ok") say("");
    panel.dataset.stations = String(stations.length);
    panel.dataset.loaded = String(Number(panel.dataset.loaded ?? 0) + 1);
  }

  // Shows the list again after a change: the pane's rows and the station list.
  function reload() {
    listener.show(current, title);
    return refreshStations();
  }

  async function add(event) {
    event.preventDefault();
    const reply = await tellLibrary({ action: "radio_add", name: nameInput.value, url: urlInput.value.trim() });
    if (reply.kind !== "ok") {
      failed(reply);
      return;
    }
    nameInput.value = "";
    urlInput.value = "";
    showStatus(labels.radioAdded);
    await reload();
  }

  async function mark(station, favorite) {
    const reply = await tellLibrary({ action: "radio_favorite", station: station.station, favorite: favorite ? "1" : "0" });
    if (reply.kind !== "ok") {
      failed(reply);
      return;
    }
    showStatus(favorite ? labels.radioFavoriteOn : labels.radioFavoriteOff);
    await reload();
  }

  async function removeStation(station) {
    const reply = await tellLibrary({ action: "radio_remove", station: station.station });
    if (reply.kind !== "ok") {
      failed(reply);
      return;
    }
    showStatus(labels.radioRemoved);
    await reload();
  }

  form.addEventListener("submit", add);

  // Called for every selected tree node.
  function select(id, text) {
    const node = listedRadioNode(id);
    current = isRadioNode(node) ? node : null;
    title = text;
    generation += 1;
    panel.hidden = current === null;
    panel.dataset.node = current ?? "";
    say("");
    stationList.replaceChildren();
    stationList.hidden = true;
    if (current === null) return;
    form.hidden = current !== USER_DEFINED;
    if (current === USER_DEFINED || current === FAVORITES) refreshStations();
    // After the pane has come up (the listing is shown next).
    if (id === ADD_BUTTON) requestAnimationFrame(() => nameInput.focus());
  }

  // A failed listing of the pane: the radio words for it (also shown in the pane), or null.
  function failure(reply) {
    if (current === null || reply.kind !== "error") return null;
    const words = radioErrorWords(labels, reply.code);
    if (words) say(words);
    return words;
  }

  return { select, failure };
}
