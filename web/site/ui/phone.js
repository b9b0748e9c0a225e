// The phone layout's behaviour: below PHONE_WIDTH the tree is a drawer over the pane, opened by the
// header's button and closed by choosing a node that the pane lists, by Escape or by a tap beside
// it. Closed, it is inert (out of the keyboard's and the screen reader's way).
export const PHONE_WIDTH = 700; // px; phone.css uses the same width

const $ = (id) => document.getElementById(id);

// `chosen(id)`: whether choosing the tree node `id` shows something in the pane (the drawer closes).
export function createDrawer({ labels, chosen }) {
  const side = $("side");
  const toggle = $("tree-toggle");
  const narrow = window.matchMedia(`(max-width: ${PHONE_WIDTH - 0.02}px)`);
  let open = false;
  const backdrop = document.createElement("div");
  backdrop.className = "drawer-backdrop";
  backdrop.setAttribute("aria-hidden", "true");
  side.after(backdrop);

  function apply() {
    const phone = narrow.matches;
    document.body.dataset.layout = phone ? "phone" : "wide";
    side.inert = phone && !open;
    document.body.dataset.drawer = phone ? (open ? "open" : "closed") : "none";
    toggle.setAttribute("aria-expanded", String(phone && open));
    const words = open ? labels.treeClose : labels.treeOpen;
    toggle.title = words;
    toggle.setAttribute("aria-label", words);
  }
  function set(value, { focus = true } = {}) {
    open = value;
    apply();
    if (!focus) return;
    if (open) (side.querySelector('li[aria-selected="true"] > .row') ?? side.querySelector("li[role=treeitem] > .row"))?.focus();
    else toggle.focus();
  }

  toggle.addEventListener("click", () => set(!open));
  backdrop.addEventListener("click", () => set(false));
  side.addEventListener("keydown", (event) => {
    if (narrow.matches && open && event.key === "Escape") {
      event.preventDefault();
      set(false);
    }
  });
  // After the tree's own handlers (bubbling): a node chosen by a tap or by Enter closes the drawer.
  const choose = (li) => {
    if (narrow.matches && open && li && chosen(li.dataset.id ?? "")) set(false);
  };
  side.addEventListener("click", (event) => {
    if (event.target.classList.contains("twisty")) return;
    choose(event.target.closest("li[role=treeitem]"));
  });
  side.addEventListener("keydown", (event) => {
    if (event.key === "Enter" || event.key === " ") choose(event.target.closest("li[role=treeitem]"));
  });
  narrow.addEventListener("change", () => apply());
  toggle.textContent = labels.treeOpen;
  apply();
  return { set, isOpen: () => open };
}
