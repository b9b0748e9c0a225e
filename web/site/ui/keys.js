// The page's keyboard shortcuts, wherever the focus is not in a field that takes typing:
//   Space   play or pause (what the player's Play button does)
//   n, p    the next or the previous track
//   /       the search box (the element with id "search"), when the page has one
// A key that something on the page has already handled (the tree's Space, a button's own Space) is
// left alone, as is any key with Ctrl, Alt or Meta, so the browser's own shortcuts keep working.

// Input types that take no typing: keys other than arrows do nothing in them.
const UNTYPED_INPUTS = new Set(["button", "checkbox", "color", "file", "image", "radio", "range", "reset", "submit"]);

// Whether `target` takes typed text (a text field, a text area, a list box, editable content).
export function takesTyping(target) {
  if (!target || typeof target.tagName !== "string") return false;
  const tag = target.tagName.toUpperCase();
  if (tag === "TEXTAREA" || tag === "SELECT") return true;
  if (tag === "INPUT") return !UNTYPED_INPUTS.has(String(target.type || "text").toLowerCase());
  return target.isContentEditable === true;
}

// Whether Space on `target` already means something of its own (pressing a button, ticking a box,
// choosing in a list).
function spaceIsTaken(target) {
  if (takesTyping(target)) return true;
  if (!target || typeof target.tagName !== "string") return false;
  const tag = target.tagName.toUpperCase();
  if (tag === "BUTTON" || tag === "INPUT" || tag === "SUMMARY" || tag === "A") return true;
  const role = typeof target.getAttribute === "function" ? target.getAttribute("role") : null;
  return role === "button" || role === "checkbox" || role === "switch" || role === "menuitem" || role === "option";
}

// The command of a key event: "toggle", "next", "previous", "search", or null for none.
export function commandFor(event) {
  if (event.defaultPrevented || event.ctrlKey || event.altKey || event.metaKey || event.isComposing) return null;
  const target = event.target;
  // A modal dialog (the playlist editor's) keeps its keys.
  if (target && typeof target.closest === "function" && target.closest("dialog[open]")) return null;
  if (event.key === " " || event.key === "Spacebar") return spaceIsTaken(target) || event.repeat ? null : "toggle";
  if (takesTyping(target)) return null;
  switch (event.key) {
    case "n": case "N": return "next";
    case "p": case "P": return "previous";
    case "/": return "search";
    default: return null;
  }
}

// Listens on `root` (the document) and runs the commands: each is a click on the player's own
// button, so the shortcut does exactly what the button does.
export function installShortcuts(root = document) {
  const byId = (id) => root.getElementById(id);
  byId("play")?.setAttribute("aria-keyshortcuts", "Space");
  byId("next")?.setAttribute("aria-keyshortcuts", "N");
  byId("prev")?.setAttribute("aria-keyshortcuts", "P");
  root.addEventListener("keydown", (event) => {
    const command = commandFor(event);
    if (command === null) return;
    if (command === "search") {
      // Looked up now: the search box may come and go with the view.
      const search = byId("search");
      if (!search) return;
      search.focus();
    } else {
      const button = byId({ toggle: "play", next: "next", previous: "prev" }[command]);
      if (!button || button.disabled) return;
      button.click();
    }
    event.preventDefault();
  });
}
