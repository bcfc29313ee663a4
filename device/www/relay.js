// Reads the outcome of a login from the fragment, shows it, and goes on to the page of origin.
// Anyone can write a link to this page: nothing from its address is shown but a reference number.
"use strict";

const element = (id) => document.getElementById(id);
const front = element("onward").getAttribute("href");
const start = element("again").getAttribute("href");

const tables = new Map(Object.entries(texts));
const language = navigator.languages.map((tag) => tag.split("-")[0].toLowerCase())
  .find((tag) => tables.has(tag)) || "en";
const words = tables.get(language);
const failures = new Map(Object.entries(words.failures));

let timer;

// A page of this site, by the rule of the login program (state.cpp); empty for anything else.
function ownPage(origin) {
  if (!/^\/([\w\-.~:/?#[\]@!$&'()*+,;=]|%[0-9a-f]{2})*$/i.test(origin)) return "";
  if (origin.length > 256 || origin.split(/[?#]/)[0].includes("//")) return "";
  const link = document.createElement("a");  // unlike URL(), it never throws
  link.href = origin;
  return link.origin === location.origin ? origin : "";
}

function say(id, text) {
  element(id).textContent = text;
  element(id).hidden = text === "";
}

function show(outcome, kind, [reason, help], reference = "") {
  document.title = words[outcome];
  document.body.className = kind;
  say("outcome", words[outcome]);
  say("reason", reason);
  say("help", help);
  say("reference", reference && words.reference.replace("{reference}", reference));
}

// The buttons: "again" starts another login if it has an address, "onward" leads away from here.
function offer(again, onward, label) {
  element("again").hidden = again === "";
  element("again").href = again || start;
  element("again").textContent = words.again;
  element("onward").href = onward;
  element("onward").textContent = label;
  element("onward").className = again ? "button second" : "button";
  element(again ? "again" : "onward").focus();
}

function showFailure(values) {
  // A fixed length, without 0, 1, I, L, O and U: neither a sentence nor a telephone number fits.
  const [, code, reference] =
    /^([a-z-]{1,32})\.([2-9A-HJKMNP-TV-Z]{8})$/.exec(values.get("reason")) || ["", "", ""];
  const signOut = code === "sign-out-refused";
  show(signOut ? "not-signed-out" : "not-signed-in", "bad",
       failures.get(code) || words.general, reference);
  const origin = ownPage(values.get("origin"));
  const again = start + (origin && "&origin=" + encodeURIComponent(origin));
  offer(signOut ? "" : again, front, words.front);
}

// `goOn` is false for a person who came back to this page, and would not get past it.
function showOutcome(goOn) {
  clearTimeout(timer);
  const values = new URLSearchParams(location.hash.slice(1));
  const success = values.get("success");
  if (success === "true") {
    const onward = ownPage(values.get("origin")) || front;
    show("signed-in", "good", [goOn ? words["signed-in-text"] : "", ""]);
    offer("", onward, words.onward);
    if (goOn) timer = setTimeout(() => location.replace(onward), 1500);
  } else if (success !== null) {
    showFailure(values);
  } else {
    show("signed-out", "good", [words["signed-out-text"], ""]);
    offer("", front, words.front);
  }
}

document.documentElement.lang = language;
document.documentElement.dir = words.direction;
element("device").textContent = words.device;
addEventListener("hashchange", () => showOutcome(true));
addEventListener("pagehide", () => clearTimeout(timer));
addEventListener("pageshow", (event) => { if (event.persisted) showOutcome(false); });
showOutcome(performance.getEntriesByType("navigation").every(({type}) => type !== "back_forward"));
