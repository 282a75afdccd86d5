// SPDX-License-Identifier: BSD-2-Clause
// Draws the fleet. What is shown is named by the part of the address behind "#":
//
//     #text=T&state=S&after=ID   all devices, those that match
//     #device/ID                 one device
//
// Texts of devices get into the page as text alone, never as markup.
"use strict";

const STATES = ["current", "behind", "refused", "unseen", "unplanned"];
const MEANINGS = {
  current: "as its plan wants it",
  behind: "not yet as its plan wants it",
  refused: "cannot be as its plan wants it",
  unseen: "has never called",
  unplanned: "its group has no plan",
};
const REFRESH_MS = 10000;
const SVG = "http://www.w3.org/2000/svg";

const at = (id) => document.getElementById(id);
let token = "";  // in memory only
let fleet = null;
let past = null;

/// An element with attributes; children are elements or texts.
function element(name, attributes = {}, ...children) {
  return fill(document.createElement(name), attributes, children);
}
function drawing(name, attributes = {}, ...children) {
  return fill(document.createElementNS(SVG, name), attributes, children);
}
function fill(made, attributes, children) {
  for (const [key, value] of Object.entries(attributes)) made.setAttribute(key, value);
  made.append(...children);
  return made;
}

const count_text = (number) => number.toLocaleString("en");
const devices_text = (number) => `${count_text(number)} device${number === 1 ? "" : "s"}`;
const badge = (state) => element("span", {class: `badge ${state}`}, state);

function time_text(seconds) {
  return new Date(seconds * 1000).toLocaleString("en-GB", {dateStyle: "medium", timeStyle: "medium"});
}
function ago(seconds) {
  if (!seconds) return "never";
  const age = Math.max(0, Date.now() / 1000 - seconds);
  for (const [unit, length] of [["d", 86400], ["h", 3600], ["min", 60]]) {
    if (age >= length) return `${Math.floor(age / length)} ${unit} ago`;
  }
  return `${Math.floor(age)} s ago`;
}
function when(seconds) {
  return seconds ? element("time", {datetime: new Date(seconds * 1000).toISOString(),
                                    title: time_text(seconds)}, ago(seconds)) : "never";
}

/// The answer of the server, or an Error with its reason and `status`.
async function call(path, options = {}) {
  let answer;
  try {
    answer = await fetch(path, options);
  } catch {
    throw new Error("The server cannot be reached; what is shown may be old.");
  }
  const body = answer.status === 204 ? null : await answer.json().catch(() => null);
  if (answer.ok) return body;
  const error = new Error((body && body.message) || `The server answered ${answer.status}.`);
  error.status = answer.status;
  throw error;
}

function show_trouble(text) {
  if (at("trouble").textContent !== text) at("trouble").textContent = text;
  at("trouble").hidden = !text;
}

// ---- Figures and the picture

function draw_figures() {
  const total = STATES.reduce((sum, state) => sum + fleet.devices[state], 0);
  at("summary").textContent = `${devices_text(total)}, ${count_text(fleet.open)} with a message that waits`;
  const chosen = route().state;
  at("figures").replaceChildren(...STATES.map((state) => {
    const number = fleet.devices[state];
    const share = total ? number / total * 100 : 0;
    const percent = share > 0 && share < 1 ? "under 1" : share > 99 && share < 100 ? "over 99" : Math.round(share);
    const link = element("a", {href: address({state}), class: state}, badge(state),
                         element("b", {}, count_text(number)), element("small", {}, `${percent} %, ${MEANINGS[state]}`));
    if (chosen === state) link.setAttribute("aria-current", "true");
    return element("li", {}, link);
  }));
  at("groups").replaceChildren(...fleet.groups.map((group) => element("option", {value: group.name})));
}

function pattern(id, path) {
  return drawing("pattern", {id, width: 8, height: 8, patternUnits: "userSpaceOnUse"}, drawing("path", {d: path}));
}
/// States that look alike to some get stripes.
const STRIPES = {behind: "M-2 2L2 -2M0 8L8 0M6 10L10 6", refused: "M0 0L8 8M0 8L8 0", unplanned: "M0 4H8"};

function nice_top(value) {
  const step = 10 ** Math.floor(Math.log10(Math.max(1, value)));
  return [1, 1.2, 1.5, 2, 2.5, 3, 4, 5, 6, 8, 10].map((n) => n * step).find((n) => n >= value);
}

/// Runs of entries without a gap that the servers were away for.
function runs_of(points) {
  const gaps = points.slice(1).map((point, i) => point.time - points[i].time).sort((a, b) => a - b);
  const usual = gaps.length ? Math.max(60, gaps[Math.floor(gaps.length / 2)]) : 60;
  const runs = [];
  for (const point of points) {
    const run = runs[runs.length - 1];
    if (run && point.time - run[run.length - 1].time <= 3 * usual) run.push(point);
    else runs.push([point]);
  }
  return runs;
}

function draw_picture() {
  const box = at("picture");
  const width = Math.max(260, box.clientWidth), height = 240;
  const now = {time: fleet.time, counts: STATES.map((state) => fleet.devices[state])};
  const points = past.points.filter((point) => point.time < now.time).concat(now);
  // A store that is younger than the period begins with its first entry.
  const from = Math.min(Math.max(past.from, points[0].time), now.time - 600);
  const top = nice_top(Math.max(...points.map((p) => p.counts.reduce((a, b) => a + b, 0))));
  const left = 14 + 7 * count_text(top).length, right = width - 6, base = height - 22, roof = 10;
  const x = (time) => left + (right - left) * (time - from) / (now.time - from);
  const y = (number) => base - (base - roof) * number / top;
  const svg = drawing("svg", {viewBox: `0 0 ${width} ${height}`, role: "img", "aria-label": picture_text(points)});
  svg.append(drawing("defs", {}, ...Object.entries(STRIPES).map(([state, path]) => pattern(`stripes-${state}`, path))));
  for (const share of [0, 0.5, 1]) {
    if (!Number.isInteger(top * share)) continue;
    svg.append(drawing("line", {class: "axis", x1: left, x2: right, y1: y(top * share), y2: y(top * share)}),
               drawing("text", {x: left - 6, y: y(top * share) + 4, "text-anchor": "end"}, count_text(top * share)));
  }
  const num_ticks = width < 500 ? 3 : 6;
  for (let i = 0; i <= num_ticks; ++i) {
    const time = from + (now.time - from) * i / num_ticks;
    svg.append(drawing("text", {x: x(time), y: height - 5,
                                "text-anchor": i === 0 ? "start" : i === num_ticks ? "end" : "middle"}, tick_text(time, now.time - from)));
  }
  for (const run of runs_of(points)) {
    const floor = run.map(() => 0);
    STATES.forEach((state, i) => {
      const under = run.map((p, k) => [x(p.time), y(floor[k])]);
      run.forEach((p, k) => { floor[k] += p.counts[i]; });
      if (run.every((p) => p.counts[i] === 0)) return;
      const over = run.map((p, k) => [x(p.time), y(floor[k])]);
      // A lonely entry is wide enough to be seen.
      if (run.length === 1) for (const side of [under, over]) side.unshift([side[0][0] - 3, side[0][1]]);
      const corners = over.concat(under.reverse()).map((c) => c.map((n) => n.toFixed(1)).join(",")).join(" ");
      svg.append(drawing("polygon", {class: `area ${state}`, points: corners}));
      if (STRIPES[state]) svg.append(drawing("polygon", {class: "stripes", points: corners, fill: `url(#stripes-${state})`}));
    });
  }
  box.replaceChildren(svg);
  at("legend").replaceChildren(...STATES.map((state) => element(
    "li", {class: state}, drawing("svg", {"aria-hidden": "true"},
      drawing("rect", {class: "swatch", width: "100%", height: "100%"}),
      drawing("rect", {width: "100%", height: "100%", fill: STRIPES[state] ? `url(#stripes-${state})` : "none"})), state)));
  draw_numbers(points);
}

function tick_text(seconds, period) {
  const day_or_less = period <= 86400;
  return new Date(seconds * 1000).toLocaleString("en-GB", day_or_less ? {hour: "2-digit", minute: "2-digit"}
                                                                       : {weekday: "short", hour: "2-digit", minute: "2-digit"});
}

function picture_text(points) {
  const say = (point) => STATES.map((state, i) => `${count_text(point.counts[i])} ${state}`).join(", ");
  return `Devices over time. ${time_text(points[0].time)}: ${say(points[0])}. Now: ${say(points[points.length - 1])}.`;
}

/// The table has as many rows as somebody would read.
function draw_numbers(points) {
  const stride = Math.ceil(points.length / 25);
  const rows = points.filter((point, i) => (points.length - 1 - i) % stride === 0).reverse();
  const [head, body] = at("numbers").children;
  head.replaceChildren(element("tr", {}, ...["when", ...STATES].map((name) => element("th", {scope: "col"}, name))));
  body.replaceChildren(...rows.map((point) => element(
    "tr", {}, element("th", {scope: "row"}, time_text(point.time)),
    ...point.counts.map((number) => element("td", {}, count_text(number))))));
}

async function load_fleet(with_past) {
  const period = at("period").value;
  [fleet, past] = await Promise.all([call("api/fleet"), with_past ? call(`api/history?seconds=${period}`) : past]);
  draw_figures();
  draw_picture();
}

// ---- The list

function route() {
  const hash = location.hash.slice(1);
  if (hash.startsWith("device/")) return {device: unescaped(hash.slice("device/".length))};
  const values = new URLSearchParams(hash);
  return {text: values.get("text") || "", state: values.get("state") || "", after: values.get("after") || ""};
}
function unescaped(text) {
  try {
    return decodeURIComponent(text);
  } catch {
    return text;
  }
}
function address(values) {
  const set = Object.entries(values).filter(([, value]) => value);
  return "#" + new URLSearchParams(set);
}
const device_address = (id) => "#device/" + encodeURIComponent(id);

function device_row(device) {
  const under = device.reason ? [element("span", {class: "under"}, device.reason)] : [];
  return element(
    "tr", {}, element("th", {scope: "row"}, element("a", {href: device_address(device.id)}, device.id),
                      element("span", {class: "under narrow"}, `group ${device.group}`), ...under),
    element("td", {}, badge(device.state)), element("td", {class: "wide"}, device.group), element("td", {}, when(device.seen)));
}

function found_text(shown, has_more, wanted) {
  const is_all = !wanted.text && !wanted.state;
  if (!shown) return wanted.after ? "No more devices." : is_all ? "No device is enrolled: otrp-tsm enrol." : "No device matches.";
  return `${devices_text(shown)} shown${has_more ? ", more on the next page" : ""}${is_all ? "" : ", of those that match"}.`;
}

async function load_list(wanted) {
  const {devices, has_more} = await call("api/devices?" + new URLSearchParams(
    Object.entries(wanted).filter(([, value]) => value)));
  if (address(wanted) !== address(route())) return;  // something else is wanted by now
  at("list").tBodies[0].replaceChildren(...devices.map(device_row));
  at("list").hidden = !devices.length;
  const text = found_text(devices.length, has_more, wanted);
  if (at("found").textContent !== text) at("found").textContent = text;
  at("first").hidden = !wanted.after;
  at("first").href = address({...wanted, after: ""});
  at("next").hidden = !has_more;
  if (has_more) at("next").href = address({...wanted, after: devices[devices.length - 1].id});
}

// ---- One device

function tree_row(row) {
  return element(
    "tr", {class: row.mark},
    element("th", {scope: "row"}, element("div", {class: `depth${row.depth}`}, element("small", {}, row.kind + " "), row.name)),
    element("td", {}, row.device || "\u2013"), element("td", {}, row.plan || "\u2013"), element("td", {}, row.difference));
}
function event_row(event) {
  const outcome = element("td", event.outcome === "fail" ? {class: "fail"} : {}, event.outcome);
  if (event.reason) outcome.append(element("span", {class: "under"}, event.reason));
  return element("tr", {}, element("td", {}, when(event.time)), element("td", {}, event.message), outcome,
                 element("td", {}, event.next || "nothing"));
}
function fill_table(id, rows, otherwise) {
  const row = element("tr", {}, element("td", {colspan: 4}, otherwise));
  at(id).tBodies[0].replaceChildren(...(rows.length ? rows : [row]));
}

/// What the next call will bring.
function next_text(device) {
  if (!device.plan) return "nothing: its group has no plan";
  if (device.waits && !device.waits.is_late) return `the answer to ${device.waits.message}`;
  const ask = "at its next call it is asked for its state";
  const {message, reason, obstacles} = device.next;
  if (obstacles.length) return `${ask}; if that is still so, nothing: ${obstacles.join("; ")}`;
  if (!message) return `${ask}; nothing more if that is still the same`;
  return message === "get-device-state" ? ask : `${ask}; if that is still the same, ${message} (${reason})`;
}
function waits_text(waits) {
  if (!waits) return "none";
  return `${waits.message}, ${waits.is_late ? "too late since" : "until"} ${time_text(waits.deadline)}`;
}

async function load_device(id) {
  const device = await call("api/devices/" + encodeURIComponent(id));
  if (route().device !== id) return;
  at("device").classList.remove("gone");
  at("standing").replaceChildren(badge(device.state), `: ${device.reason || MEANINGS[device.state]}`);
  const facts = {
    Group: device.group,
    "Last call": device.seen ? `${ago(device.seen)} (${time_text(device.seen)})` : "never",
    "Waits for an answer": waits_text(device.waits),
    "Next step": next_text(device),
    Plan: device.plan ? `${device.plan.slice(0, 12)}\u2026, what it does not name ${device.others === "keep" ? "stays" : "goes"}` : "none",
  };
  at("facts").replaceChildren(...Object.entries(facts).flatMap(([name, text]) => [element("dt", {}, name), element("dd", {}, text)]));
  fill_table("tree", device.tree.map(tree_row), "Nothing: the device has not told its state, or holds nothing, and nothing is planned.");
  fill_table("events", device.events.map(event_row), "It has not called yet.");
}

/// Asks for the token where the page has none, and says what came of it. `change` calls the server.
function ask_and_change(question, consequence, verb, path, options, then) {
  at("question").textContent = question;
  at("consequence").textContent = consequence;
  at("go").textContent = verb;
  at("refused").textContent = "";
  at("token").value = "";
  at("token-label").hidden = token !== "";
  at("ask").onsubmit = async (event) => {
    event.preventDefault();
    const given = token || at("token").value.trim();
    try {
      await call(path, {...options, headers: {...options.headers, Authorization: `Bearer ${given}`}});
      token = given;
      at("ask").close();
      then();
    } catch (error) {
      if (error.status === 401) {
        token = "";
        at("token-label").hidden = false;
        at("token").focus();
        at("refused").textContent = "That is not the token. Nothing was changed.";
      } else {
        at("refused").textContent = error.message;
      }
    }
  };
  at("ask").showModal();
}

function move_device(event) {
  event.preventDefault();
  const id = route().device, group = at("group").value;
  const planned = fleet && fleet.groups.some((known) => known.name === group);
  ask_and_change(`Move ${id}?`, `Its group will be "${group}", ${planned ? "and its plan that group's." : "which has no plan."}`,
                 "Move", "api/devices/" + encodeURIComponent(id),
                 {method: "POST", headers: {"Content-Type": "application/json"}, body: JSON.stringify({group})}, () => {
                   at("done").textContent = `${id} is in group "${group}" now.`;
                   at("group").value = "";
                   refresh();
                 });
}

function remove_device() {
  const id = route().device;
  ask_and_change(`Remove ${id}?`, "It can call no more, and what is known of it is forgotten. What it holds stays on it.",
                 "Remove", "api/devices/" + encodeURIComponent(id), {method: "DELETE"}, () => {
                   news = `${id} was removed.`;
                   location.hash = "";
                 });
}

// ---- What is shown

let shown = null;  // the device, or "" for all
let news = "";     // to be said there

async function refresh(with_past = true) {
  const wanted = route();
  try {
    if (wanted.device !== undefined) {
      await Promise.all([load_device(wanted.device), fleet ? null : load_fleet(true)]);
    } else {
      await Promise.all([load_list(wanted), load_fleet(with_past || !past)]);
    }
    show_trouble("");
  } catch (error) {
    at("device").classList.toggle("gone", error.status === 404);
    show_trouble(error.message);
  }
}

async function follow_address() {
  const wanted = route();
  const device = wanted.device || "";
  if (at("ask").open) at("ask").close();
  at("device").hidden = !device;
  at("fleet").hidden = Boolean(device);
  document.title = device ? `${device} \u2013 Fleet` : "Fleet";
  if (device) {
    at("name").textContent = device;
    if (shown !== device) for (const id of ["standing", "facts"]) at(id).replaceChildren();
    if (shown !== device) for (const id of ["tree", "events"]) at(id).tBodies[0].replaceChildren();
  } else {
    if (document.activeElement !== at("text")) at("text").value = wanted.text;
    at("state").value = wanted.state;
    at("back").href = address(wanted);
  }
  const is_first = shown === null;
  if (shown !== device) {
    at("done").textContent = news;
    news = "";
    if (!is_first) (device ? at("name") : at("devices")).focus({preventScroll: Boolean(!device)});
    if (!is_first) window.scrollTo(0, 0);
  }
  shown = device;
  await refresh();
}

let typing = 0;
function search() {
  clearTimeout(typing);
  typing = setTimeout(() => {
    const wanted = address({text: at("text").value, state: at("state").value});
    history.replaceState(null, "", wanted);
    at("back").href = wanted;
    refresh(false);
  }, 200);
}

at("state").append(...STATES.map((state) => element("option", {value: state}, state)));
at("search").addEventListener("submit", (event) => event.preventDefault());
at("text").addEventListener("input", search);
at("state").addEventListener("change", search);
at("period").addEventListener("change", () => refresh());
at("move").addEventListener("submit", move_device);
at("remove").addEventListener("click", remove_device);
at("cancel").addEventListener("click", () => at("ask").close());
document.querySelector(".skip").addEventListener("click", (event) => {
  event.preventDefault();
  (at("fleet").hidden ? at("name") : at("devices")).focus();
});
window.addEventListener("hashchange", follow_address);
new ResizeObserver(() => { if (fleet && past && !at("fleet").hidden) draw_picture(); }).observe(at("picture"));
setInterval(() => { if (!document.hidden && !at("ask").open) refresh(); }, REFRESH_MS);
follow_address();
