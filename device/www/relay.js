// Reads the outcome of a login from the fragment, shows it, and goes on to the page of origin.
"use strict";

// A page of this very site, or the front page: anybody can write a link to this one.
function ownPage(origin) {
  if (!origin || !origin.startsWith("/")) return "/";
  const url = new URL(origin, location.href);
  // A path may begin with "//" once its dots are resolved: alone, that would be another host's.
  return url.origin === location.origin && !url.pathname.startsWith("//") ? url.href : "/";
}

function show(outcome, reason, onward, label) {
  const text = document.getElementById("reason");
  const link = document.getElementById("onward");
  document.title = outcome;
  document.getElementById("outcome").textContent = outcome;
  text.textContent = reason;
  text.hidden = reason === "";
  link.textContent = label;
  link.href = onward;
  link.focus();
}

const values = new URLSearchParams(location.hash.slice(1));
const success = values.get("success");

if (success === "true") {
  const onward = ownPage(values.get("origin"));
  show("Signed in", "", onward, "Go on");
  setTimeout(() => location.replace(onward), 1500);
} else if (success === "false") {
  show("Not signed in", values.get("reason") || "", "/", "Back to the device");
} else {
  show("Signed out", "", "/", "Back to the device");
}
