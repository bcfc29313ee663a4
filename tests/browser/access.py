"""What keeps people out of a page: checks of the rules that a program can decide (WCAG 2, A and AA).

No package of Debian has a checker of accessibility. These are its rules as far as our pages have
anything to check: names come from Chromium's own accessibility tree, colours and sizes from what
it has laid out.
"""

LOOK = r"""
const found = [];
const report = (rule, node) => found.push(rule + ": " + (node.outerHTML || node).slice(0, 80));
const all = (what) => [...document.querySelectorAll(what)];
const visible = (node) => node.checkVisibility({visibilityProperty: true}) &&
                          node.getClientRects().length > 0;

if (!document.title.trim()) report("document-title", "title");
if (!/^[a-z]{2}$/.test(document.documentElement.lang)) report("html-has-lang", "html");
for (const meta of all("meta[name=viewport]")) {
  if (/user-scalable|maximum-scale/.test(meta.content)) report("meta-viewport", meta);
}
for (const meta of all("meta[http-equiv=refresh]")) {
  if (!meta.content.startsWith("0;")) report("meta-refresh", meta);
}
if (all("main").length !== 1) report("landmark-one-main", "main");
if (all("h1").filter(visible).length !== 1) report("one-h1", "h1");
const ids = all("[id]").map((node) => node.id);
for (const id of ids) if (ids.indexOf(id) !== ids.lastIndexOf(id)) report("duplicate-id", id);
for (const node of all("img:not([alt])")) report("image-alt", node);
for (const node of all("[tabindex]")) if (node.tabIndex > 0) report("tabindex", node);
for (const node of all("input:not([type=hidden]), select, textarea")) {
  if (!node.labels.length && !node.ariaLabel) report("label", node);
}
for (const node of all("[role]")) {
  if (!["status", "alert"].includes(node.role)) report("aria-roles", node);
}
for (const node of all("[aria-labelledby], [aria-describedby]")) {
  for (const name of ["aria-labelledby", "aria-describedby"]) {
    const id = node.getAttribute(name);
    if (id && !document.getElementById(id)) report("aria-valid-attr-value", node);
  }
}
for (const node of all("a, button").filter(visible)) {
  const {width, height} = node.getBoundingClientRect();
  const least = node.matches(".button") ? 44 : 24;
  if (width < least || height < least) report("target-size", node);
  const quiet = node.matches("a:not(.button)");
  if (quiet && getComputedStyle(node).textDecorationLine !== "underline") {
    report("link-in-text-block", node);
  }
}

// The luminance of a colour, and the contrast of two of them, as WCAG defines them.
const parts = (colour) => colour.match(/[\d.]+/g).map(Number);
const luminance = (colour) => {
  const [r, g, b] = parts(colour).slice(0, 3).map((value) => {
    const part = value / 255;
    return part <= 0.04045 ? part / 12.92 : ((part + 0.055) / 1.055) ** 2.4;
  });
  return 0.2126 * r + 0.7152 * g + 0.0722 * b;
};
const contrast = (one, two) => {
  const [dark, light] = [luminance(one), luminance(two)].sort((a, b) => a - b);
  return (light + 0.05) / (dark + 0.05);
};
const behind = (node) => {
  for (; node; node = node.parentElement) {
    const colour = getComputedStyle(node).backgroundColor;
    if (parts(colour)[3] !== 0) return colour;
  }
  return "rgb(255, 255, 255)";
};
const words = document.createTreeWalker(document.body, NodeFilter.SHOW_TEXT);
while (words.nextNode()) {
  const node = words.currentNode.parentElement;
  if (!words.currentNode.data.trim() || node.tagName === "NOSCRIPT" || !visible(node)) continue;
  const style = getComputedStyle(node);
  const least = parseFloat(style.fontSize) >= 24 ? 3 : 4.5;
  if (contrast(style.color, behind(node)) < least) report("color-contrast", node);
  if (!node.closest("header, main")) report("region", node);
}
const focused = document.activeElement;
if (focused !== document.body) {
  const style = getComputedStyle(focused);
  if (style.outlineStyle === "none" || parseFloat(style.outlineWidth) < 2) {
    report("focus-visible", focused);
  } else if (contrast(style.outlineColor, behind(focused.parentElement)) < 3) {
    report("focus-contrast", focused);
  }
}
return found;
"""

NAMED = ("link", "button", "image", "textbox", "heading")


def findings(tab):
    """What is wrong with the page in a tab: a rule and its element, one text each."""
    found = tab.script(LOOK)
    for node in tab.command("Accessibility.getFullAXTree")["nodes"]:
        role = node.get("role", {}).get("value")
        if not node.get("ignored") and role in NAMED:
            if not node.get("name", {}).get("value", "").strip():
                found.append(role + "-name")
    return found


CUT = r"""
return [...document.querySelectorAll("*")].filter(
  (node) => node.clientWidth > 0 && node.scrollWidth > node.clientWidth + 1).map(
  (node) => node.outerHTML.slice(0, 80));
"""


def cut(tab):
    """Elements whose content is wider than they are: a person must scroll, or does not see it."""
    return tab.script(CUT)
