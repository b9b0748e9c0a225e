// Filling the page's words. A word has {name} places for values; a word that counts something
// ("{count} tracks") may have a second form under the same key with "One" after it, which the
// languages whose plural rules say "one" for that count use ("1 track", "1 piste" and "0 piste").

// The word with each {name} replaced by values[name] (nothing for a value not given).
export function format(template, values = {}) {
  return String(template ?? "").replace(/\{(\w+)\}/g, (_, name) => String(values[name] ?? ""));
}

const rules = new Map();
function pluralOf(count, htmlLang) {
  const tag = htmlLang || globalThis.document?.documentElement?.lang || "en";
  if (!rules.has(tag)) {
    let rule;
    try { rule = new Intl.PluralRules(tag); } catch { rule = new Intl.PluralRules("en"); }
    rules.set(tag, rule);
  }
  return rules.get(tag).select(count);
}

// words[key] (or words[key + "One"] where the language says "one" for count) filled with count and
// the other values. htmlLang: the language tag whose rules apply; the page's own when not given.
export function counted(words, key, count, values = {}, htmlLang) {
  const one = words?.[`${key}One`];
  const template = typeof one === "string" && pluralOf(count, htmlLang) === "one" ? one : words?.[key];
  return format(template, { ...values, count });
}
