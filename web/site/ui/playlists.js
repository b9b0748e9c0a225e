// Playlists made and changed from the page: "New Playlist" (a playlist or a smart playlist), the
// tools above a listed playlist (rename, delete, a smart playlist's rules), the buttons of its rows
// (move up, move down, remove) and "Add to" on every list of tracks. Every change is a POST to
// webapi/library.cgi; a refused one is worded from its "error" code in the user's language.
import { counted, format } from "./text.js";
import { askLibrary, tellLibrary } from "./library.js";
const PERSONAL = "musiclib_music_personal";
const SHARED = "musiclib_music_shared";
const NEW_BUTTONS = { [`${PERSONAL}_new`]: "personal", [`${SHARED}_new`]: "shared" };
const RULES = [
  ["artist", "ruleArtist", "text"], ["album", "ruleAlbum", "text"], ["genre", "ruleGenre", "text"],
  ["title", "ruleTitle", "text"], ["year_from", "ruleYearFrom", "number"], ["year_to", "ruleYearTo", "number"],
  ["path", "rulePath", "text"], ["added_within_days", "ruleAdded", "number"],
  ["duration_min", "ruleDurationMin", "number"], ["duration_max", "ruleDurationMax", "number"],
  ["limit", "ruleLimit", "number"], ["order", "ruleOrder", "order"],
];
const ORDERS = [["", "orderPath"], ["artist", "orderArtist"], ["album", "orderAlbum"], ["title", "orderTitle"],
  ["year", "orderYear"], ["added", "orderAdded"], ["random", "orderRandom"]];

const PLAYLIST_NODE = /^musiclib_music_(personal|shared)\/playlist\/(.+)$/;
const SMART_NODE = /^musiclib_music_(personal|shared)\/smart\/(.+)$/;

// One change: resolves to {ok: true, body} or {ok: false, error, rule, status}.
async function post(params) {
  return resultOf(await tellLibrary(params));
}

// A library.cgi reply as the dialogs and the tools read it.
function resultOf(reply) {
  if (reply.kind === "ok") return { ok: true, body: reply.body };
  if (reply.kind === "offline") return { ok: false, error: "offline" };
  return { ok: false, status: reply.status, error: reply.code ?? "", rule: reply.rule };
}

export function createPlaylists({ labels, onStatus, onFailure, refreshCategory, selectNode, reshow, categoryNodes }) {
  const state = { node: "", title: "", list: null, target: "" };
  const $ = (id) => document.getElementById(id);

  // --- the words of a refused change ---------------------------------------------------------------
  function errorText(result) {
    if (result.error === "offline") return labels.offline;
    if (result.status === 401) return labels.sessionExpired;
    const ruleLabel = RULES.find(([key]) => key === result.rule)?.[1];
    const words = labels[`err_${result.error}`];
    if (words) return format(words, { rule: ruleLabel ? labels[ruleLabel] : result.rule ?? "" });
    return format(labels.err_other, { code: result.error || `HTTP ${result.status}` });
  }

  // --- a form in a dialog --------------------------------------------------------------------------
  // `build(form)` adds the fields; `submit(form)` resolves to null (done) or a failed result.
  function openDialog({ title, submitLabel, build, submit, danger = false }) {
    const dialog = document.createElement("dialog");
    dialog.className = "pl-dialog";
    dialog.setAttribute("aria-labelledby", "pl-dialog-title");
    const form = document.createElement("form");
    form.method = "dialog";
    const heading = document.createElement("h3");
    heading.id = "pl-dialog-title";
    heading.textContent = title;
    const fields = document.createElement("div");
    fields.className = "pl-fields";
    const error = document.createElement("p");
    error.className = "pl-error";
    error.id = "pl-dialog-error";
    error.setAttribute("role", "alert");
    error.hidden = true;
    const buttons = document.createElement("div");
    buttons.className = "pl-buttons";
    const ok = document.createElement("button");
    ok.type = "submit";
    ok.id = "pl-dialog-ok";
    ok.textContent = submitLabel;
    if (danger) ok.classList.add("danger");
    const cancel = document.createElement("button");
    cancel.type = "button";
    cancel.id = "pl-dialog-cancel";
    cancel.textContent = labels.plCancel;
    cancel.addEventListener("click", () => dialog.close());
    buttons.append(ok, cancel);
    form.append(heading, fields, error, buttons);
    dialog.append(form);
    build(fields);
    dialog.addEventListener("close", () => dialog.remove());
    form.addEventListener("submit", async (event) => {
      event.preventDefault();
      ok.disabled = true;
      for (const field of form.querySelectorAll("[aria-invalid]")) field.removeAttribute("aria-invalid");
      const failed = await submit(form);
      ok.disabled = false;
      if (!failed) {
        dialog.close();
        return;
      }
      error.textContent = errorText(failed);
      error.hidden = false;
      const field = failed.rule ? form.elements[failed.rule] : failed.error === "name_invalid" || failed.error === "name_taken" ? form.elements.name : null;
      if (field) {
        field.setAttribute("aria-invalid", "true");
        field.setAttribute("aria-describedby", error.id);
        field.focus();
      }
    });
    document.body.append(dialog);
    dialog.showModal();
    const first = form.querySelector("input, select");
    if (first) first.focus();
    return dialog;
  }

  function addField(parent, name, label, { type = "text", value = "", options = null } = {}) {
    const wrap = document.createElement("label");
    wrap.className = "pl-field";
    const caption = document.createElement("span");
    caption.textContent = label;
    let input;
    if (options) {
      input = document.createElement("select");
      for (const [optionValue, optionLabel] of options) {
        const option = document.createElement("option");
        option.value = optionValue;
        option.textContent = optionLabel;
        input.append(option);
      }
      input.value = value;
    } else {
      input = document.createElement("input");
      input.type = type === "number" ? "text" : "text";
      if (type === "number") input.inputMode = "numeric";
      input.value = value;
      input.autocomplete = "off";
    }
    input.name = name;
    wrap.append(caption, input);
    parent.append(wrap);
    return input;
  }

  function addRuleFields(parent, rules = {}) {
    const box = document.createElement("fieldset");
    box.className = "pl-rules";
    for (const [key, label, kind] of RULES) {
      const options = kind === "order" ? ORDERS.map(([value, word]) => [value, labels[word]]) : null;
      addField(box, key, labels[label], { type: kind, value: typeof rules[key] === "string" ? rules[key] : "", options });
    }
    parent.append(box);
    return box;
  }

  function ruleParams(form) {
    const params = {};
    for (const [key] of RULES) params[key] = String(form.elements[key].value ?? "").trim();
    return params;
  }

  // --- "New Playlist" ------------------------------------------------------------------------------
  function create(buttonId) {
    const category = NEW_BUTTONS[buttonId];
    let rulesBox;
    openDialog({
      title: labels.plNew,
      submitLabel: labels.plCreate,
      build(fields) {
        addField(fields, "name", labels.plName);
        const kind = addField(fields, "kind", labels.plKind, { options: [["plain", labels.plKindPlain], ["smart", labels.plKindSmart]], value: "plain" });
        rulesBox = addRuleFields(fields);
        rulesBox.hidden = true;
        kind.addEventListener("change", () => { rulesBox.hidden = kind.value !== "smart"; });
      },
      async submit(form) {
        const name = form.elements.name.value;
        const smart = form.elements.kind.value === "smart";
        const result = smart
          ? await post({ action: "smartsave", category, name, ...ruleParams(form) })
          : await post({ action: "plcreate", category, name });
        if (!result.ok) return result;
        await refreshCategory(category === "shared" ? SHARED : PERSONAL);
        selectNode(result.body.node);
        onStatus(format(labels.plCreated, { name }));
        return null;
      },
    });
  }

  // --- the tools above a list ----------------------------------------------------------------------
  function toolbar() {
    let bar = $("playlist-tools");
    if (!bar) {
      bar = document.createElement("div");
      bar.id = "playlist-tools";
      bar.className = "list-tools playlist-tools";
      $("listing").querySelector(".list-tools").after(bar);
    }
    return bar;
  }

  function button(id, text, onClick) {
    const b = document.createElement("button");
    b.type = "button";
    b.id = id;
    b.textContent = text;
    b.addEventListener("click", onClick);
    return b;
  }

  // The playlists tracks can be added to: the personal ones, and the shared ones when the tree
  // offers this user a new shared playlist.
  function targets() {
    const mayShared = categoryNodes(SHARED).some((node) => node.id === `${SHARED}_new`);
    const list = [];
    for (const category of [PERSONAL, SHARED]) {
      if (category === SHARED && !mayShared) continue;
      for (const node of categoryNodes(category))
        if (PLAYLIST_NODE.test(node.id)) list.push(node);
    }
    return list;
  }

  function listed(node, title, list) {
    state.node = node;
    state.title = title;
    state.list = list;
    const bar = toolbar();
    bar.replaceChildren();
    const playlist = PLAYLIST_NODE.exec(node);
    const smart = SMART_NODE.exec(node);
    const mayChange = (m) => m && (m[1] === "personal" || categoryNodes(SHARED).some((n) => n.id === `${SHARED}_new`));
    if (playlist && mayChange(playlist)) bar.append(button("pl-rename", labels.plRename, () => rename(node, title)));
    if (smart && mayChange(smart)) bar.append(button("pl-edit-rules", labels.plEditRules, () => editRules(node, title)));
    if ((playlist && mayChange(playlist)) || (smart && mayChange(smart)))
      bar.append(button("pl-delete", labels.plDelete, () => remove(node, title)));
    const choices = targets().filter((t) => t.id !== node);
    if (list.tracks.length > 0 && choices.length > 0) {
      const label = document.createElement("label");
      label.className = "pl-target";
      const caption = document.createElement("span");
      caption.textContent = labels.plAddTo;
      const select = document.createElement("select");
      select.id = "pl-target";
      const none = document.createElement("option");
      none.value = "";
      none.textContent = labels.plChoose;
      select.append(none);
      for (const t of choices) {
        const option = document.createElement("option");
        option.value = t.id;
        option.textContent = t.text;
        select.append(option);
      }
      select.value = choices.some((t) => t.id === state.target) ? state.target : "";
      select.addEventListener("change", () => {
        state.target = select.value;
        addAll.disabled = state.target === "";
        reshowRows();
      });
      label.append(caption, select);
      const addAll = button("pl-add-all", labels.plAddAll, () => add(list.tracks));
      addAll.disabled = select.value === "";
      bar.append(label, addAll);
    } else {
      state.target = choices.some((t) => t.id === state.target) ? state.target : "";
    }
    bar.hidden = bar.childElementCount === 0;
  }

  function reshowRows() {
    // The rows' add buttons follow the chosen target: the list is drawn again as it is.
    window.dispatchEvent(new Event("resize"));
  }

  // --- the buttons of a row ------------------------------------------------------------------------
  function decorateRow(row, track, index, node) {
    const playlist = PLAYLIST_NODE.exec(node);
    const editable = playlist && (playlist[1] === "personal" || categoryNodes(SHARED).some((n) => n.id === `${SHARED}_new`));
    const tools = document.createElement("span");
    tools.className = "row-tools";
    const small = (cls, text, title, onClick) => {
      const b = document.createElement("button");
      b.type = "button";
      b.className = cls;
      b.textContent = text;
      b.title = title;
      b.setAttribute("aria-label", `${title}: ${track.title ?? ""}`);
      b.addEventListener("click", (event) => {
        event.stopPropagation();
        onClick();
      });
      return b;
    };
    if (editable && Number.isInteger(track.entry)) {
      const count = state.list ? state.list.tracks.length : 0;
      if (index > 0) tools.append(small("pl-up", "\u2191", labels.plUp, () => move(node, track, state.list.tracks[index - 1].entry)));
      if (index < count - 1) tools.append(small("pl-down", "\u2193", labels.plDown, () => move(node, track, state.list.tracks[index + 1].entry)));
      tools.append(small("pl-remove", "\u2715", labels.plRemove, () => removeEntry(node, track)));
    }
    if (state.target && state.target !== node && typeof track.stream === "string")
      tools.append(small("pl-add", "+", labels.plAddOne, () => add([track])));
    if (tools.childElementCount > 0) {
      row.classList.add("with-tools");
      row.append(tools);
    }
  }

  // --- the changes ---------------------------------------------------------------------------------
  async function change(params, done) {
    const result = await post(params);
    if (!result.ok) {
      onFailure(errorText(result));
      return false;
    }
    onStatus(done);
    return true;
  }

  async function add(tracks) {
    const target = state.target;
    const streams = tracks.map((t) => t.stream).filter((s) => typeof s === "string");
    if (!target || streams.length === 0) return;
    const name = targets().find((t) => t.id === target)?.text ?? "";
    await change({ action: "pladd", node: target, streams: streams.join(",") }, counted(labels, "plAdded", streams.length, { name }));
  }

  // Entry numbers name the rows as this page listed them; `expect` (the track seen there) makes the
  // server refuse the change when another tab or user changed the playlist since. Either way the
  // playlist is shown again as it is.
  async function changeEntries(params, done, node) {
    const result = await post(params);
    if (result.ok) {
      onStatus(done);
      reshow(node, state.title);
      return;
    }
    if (result.error === "playlist_changed") await reshow(node, state.title);
    onFailure(errorText(result));
  }

  async function move(node, track, to) {
    await changeEntries({ action: "plmove", node, from: track.entry, to, expect: track.stream }, labels.plMoved, node);
  }

  async function removeEntry(node, track) {
    await changeEntries({ action: "plremove", node, entries: String(track.entry), expect: track.stream }, labels.plRemoved, node);
  }

  function rename(node, title) {
    const category = node.startsWith(SHARED) ? SHARED : PERSONAL;
    openDialog({
      title: labels.plRename,
      submitLabel: labels.plSave,
      build(fields) { addField(fields, "name", labels.plName, { value: title }); },
      async submit(form) {
        const result = await post({ action: "plrename", node, name: form.elements.name.value });
        if (!result.ok) return result;
        await refreshCategory(category);
        selectNode(result.body.node ?? node);
        onStatus(labels.plRenamed);
        return null;
      },
    });
  }

  function remove(node, title) {
    const smart = SMART_NODE.test(node);
    const category = node.startsWith(SHARED) ? SHARED : PERSONAL;
    openDialog({
      title: format(labels.plDeleteConfirm, { name: title }),
      submitLabel: labels.plDelete,
      danger: true,
      build() {},
      async submit() {
        const result = await post({ action: smart ? "smartdelete" : "pldelete", node });
        if (!result.ok) return result;
        await refreshCategory(category);
        selectNode(category);
        onStatus(labels.plDeleted);
        return null;
      },
    });
  }

  async function editRules(node, title) {
    const match = SMART_NODE.exec(node);
    const asked = resultOf(await askLibrary({ action: "smartget", node }));
    if (!asked.ok) {
      onFailure(errorText(asked));
      return;
    }
    const reply = asked.body;
    openDialog({
      title: format(labels.plRulesTitle, { name: title }),
      submitLabel: labels.plSave,
      build(fields) {
        addField(fields, "name", labels.plName, { value: reply.name });
        addRuleFields(fields, reply.rules ?? {});
      },
      async submit(form) {
        const name = form.elements.name.value;
        const result = await post({ action: "smartsave", category: match[1], old: reply.name, name, ...ruleParams(form) });
        if (!result.ok) return result;
        if (name !== reply.name) {
          await refreshCategory(match[1] === "shared" ? SHARED : PERSONAL);
          selectNode(result.body.node);
        } else {
          reshow(node, title);
        }
        onStatus(labels.plSaved);
        return null;
      },
    });
  }

  return {
    isNewButton: (id) => Object.hasOwn(NEW_BUTTONS, id),
    create,
    listed,
    decorateRow,
    hide() { const bar = $("playlist-tools"); if (bar) bar.hidden = true; },
  };
}
