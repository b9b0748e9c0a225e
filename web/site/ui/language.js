// The page's language and the picker in the header bar. The user's own choice is saved through
// library.cgi (action=language) in the user's preference folder; the page reloads in it. "Browser
// language" drops the choice: the page then speaks what the tree CGI speaks (the administrator's
// choice in users.conf, else the browser's language). The tree CGI itself keeps its language, so
// the texts of the tree's own nodes are shown in the page's language from the UI text tables.
import { askLibrary, tellLibrary } from "./library.js";
import { HTML_LANG } from "./labels.js";
import { LANGUAGE_NAMES } from "./words/a11y.js";

export const AUTOMATIC = "def";

// What the picker shows as chosen: the saved language when it is one of the page's own, else
// "Browser language".
export function pickedLanguage(saved) {
  return typeof saved === "string" && Object.hasOwn(LANGUAGE_NAMES, saved) ? saved : AUTOMATIC;
}

// The page's language, the tree CGI's and the user's saved choice, from library.cgi; null when it
// cannot say (the page then asks uilang.cgi, or reads the browser's languages).
export async function askLanguages() {
  const reply = await askLibrary({ action: "language" });
  if (reply.kind !== "ok") return null;
  const { language, tree, saved } = reply.body;
  const code = (value) => (typeof value === "string" && /^[a-z]{3}$/.test(value) ? value : null);
  if (!code(language) || !code(tree)) return null;
  return { language: code(language), tree: code(tree), saved: typeof saved === "string" ? saved : "" };
}

// The text of a node of the tree's own (a category, a button: an id of lower-case words) in the
// page's language: the UI text that says it in the tree CGI's language, taken from the page's
// language's table. Any other text (an album's name, a playlist's) stays as it is.
export function treeTextTranslator(texts, from, to) {
  if (from === to || !texts?.[from] || !texts?.[to]) return (text) => text;
  const found = new Map();
  for (const [section, table] of Object.entries(texts[from]))
    for (const [key, text] of Object.entries(table ?? {})) {
      const own = texts[to]?.[section]?.[key];
      if (typeof text === "string" && typeof own === "string" && own !== "" && !found.has(text)) found.set(text, own);
    }
  return (text, id) => (typeof id === "string" && /^[a-z0-9_]+$/.test(id) && found.has(text) ? found.get(text) : text);
}

// `showFailure(reply)` and `showStatus(text, isError)`: the status line, for a save that failed;
// `reload()`: the page again.
// `saved`: the user's saved choice, when the page knows it already.
export function createLanguagePicker({ labels, saved, showFailure, showStatus, reload = () => location.reload() }) {
  const select = document.getElementById("language");
  if (!select) return null;
  const label = document.getElementById("language-label");
  if (label) label.textContent = labels.language;
  const automatic = new Option(labels.languageAuto, AUTOMATIC);
  select.replaceChildren(automatic);
  for (const [code, name] of Object.entries(LANGUAGE_NAMES)) {
    const option = new Option(name, code);
    option.lang = HTML_LANG[code] ?? "";
    select.append(option);
  }
  select.value = pickedLanguage(saved);
  select.disabled = typeof saved !== "string"; // library.cgi did not answer: nothing to save to
  select.dataset.ready = "true";
  select.addEventListener("change", async () => {
    select.disabled = true;
    const reply = await tellLibrary({ action: "language", language: select.value });
    if (reply.kind === "ok") {
      reload();
      return;
    }
    select.disabled = false;
    if (reply.code === "language_unwritable") showStatus(labels.languageUnwritable, true);
    else showFailure(reply);
  });
  return select;
}
