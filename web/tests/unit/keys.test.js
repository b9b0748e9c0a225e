// The page's keyboard shortcuts: which key does what, and where a key is left to the field or the
// button that has the focus.
import { test } from "node:test";
import assert from "node:assert/strict";
import { commandFor, takesTyping } from "../../site/ui/keys.js";

const element = (tagName, attributes = {}) => ({
  tagName, type: attributes.type, isContentEditable: attributes.editable === true,
  getAttribute: (name) => attributes[name] ?? null,
  closest: (selector) => (selector === "dialog[open]" && attributes.inDialog ? {} : null),
});
const key = (k, target = element("DIV"), extra = {}) => commandFor({ key: k, target, defaultPrevented: false, ...extra });

test("space plays or pauses, n and p step, / goes to the search box, anywhere outside a field", () => {
  for (const target of [element("BODY"), element("DIV", { role: "row" }), element("DIV", { role: "grid" }), element("DIV", { role: "treeitem" })]) {
    assert.equal(key(" ", target), "toggle");
    assert.equal(key("n", target), "next");
    assert.equal(key("N", target), "next");
    assert.equal(key("p", target), "previous");
    assert.equal(key("/", target), "search");
  }
  assert.equal(key("x"), null);
  assert.equal(key("Enter"), null);
});

test("typing in a text field, a text area, a list box or editable text is never a shortcut", () => {
  for (const target of [element("INPUT"), element("INPUT", { type: "url" }), element("INPUT", { type: "search" }), element("TEXTAREA"),
    element("SELECT"), element("DIV", { editable: true })]) {
    assert.equal(takesTyping(target), true);
    for (const k of [" ", "n", "p", "/"]) assert.equal(key(k, target), null, `${target.tagName} ${k}`);
  }
  for (const target of [element("INPUT", { type: "range" }), element("INPUT", { type: "checkbox" }), element("BUTTON"), element("DIV")])
    assert.equal(takesTyping(target), false);
});

test("space on a button, a slider or a box presses that, but n, p and / still work there", () => {
  for (const target of [element("BUTTON"), element("INPUT", { type: "range" }), element("INPUT", { type: "checkbox" }), element("A"),
    element("DIV", { role: "button" }), element("SUMMARY")]) {
    assert.equal(key(" ", target), null, target.tagName);
    assert.equal(key("n", target), "next");
    assert.equal(key("/", target), "search");
  }
});

test("a key with Ctrl, Alt or Meta, one already handled, a held-down space or a key in an open dialog is left alone", () => {
  assert.equal(key("n", element("DIV"), { ctrlKey: true }), null);
  assert.equal(key("p", element("DIV"), { altKey: true }), null);
  assert.equal(key("/", element("DIV"), { metaKey: true }), null);
  assert.equal(key(" ", element("DIV"), { defaultPrevented: true }), null);
  assert.equal(key(" ", element("DIV"), { repeat: true }), null);
  assert.equal(key("n", element("DIV", { inDialog: true })), null);
  assert.equal(key("n", element("DIV"), { isComposing: true }), null);
});
