// SPDX-License-Identifier: Apache-2.0
//
// Draws the page from the element #data. docs/report.md says what it shows. All names in the data come from programs on the
// device, so they are only ever set as text. The page of `twctl serve` has `live` in its data: it then also asks its server for what
// runs now, and for newer data.
"use strict";
(() => {
  // Control characters, and those that turn the direction of writing and so could change how the text around a name reads.
  const UNPRINTABLE = /[\u0000-\u001f\u007f-\u009f\u061c\u200e\u200f\u2028\u2029\u202a-\u202e\u2066-\u2069]/g;
  const parse = (text) => JSON.parse(text, (_, value) => (typeof value === "string" ? value.replace(UNPRINTABLE, "\ufffd") : value));
  let data = parse(document.getElementById("data").textContent);
  const page = document.getElementById("page");
  const { plot, select } = charts;

  // ---- Numbers and times for people

  const UNKNOWN = "not known";
  const named = (name) => (name === null || name === undefined || name === "" ? UNKNOWN : String(name));
  const whole = new Intl.NumberFormat("en-GB", { maximumFractionDigits: 0 });
  const count = (number) => (number === null || number === undefined ? "" : whole.format(number));
  const percent = (share) => (share === null || share === undefined ? "" : `${Math.round(share * 100)} %`);
  const many = (number, one, more) => `${count(number)} ${number === 1 ? one : more}`;

  // "3 h 12 min", "4 min 10 s", "2.5 s", "20 ms"
  function duration(seconds) {
    if (seconds === null || seconds === undefined) return "";
    if (seconds === 0) return "0 s";
    if (seconds < 1) return `${Math.max(1, Math.round(seconds * 1000))} ms`;
    if (seconds < 9.95) return `${Math.round(seconds * 10) / 10} s`;
    if (seconds < 59.5) return `${Math.round(seconds)} s`;
    if (seconds < 3570) {
      const all = Math.round(seconds);
      return all < 600 && all % 60 ? `${Math.floor(all / 60)} min ${all % 60} s` : `${Math.round(all / 60)} min`;
    }
    const minutes = Math.round(seconds / 60);
    if (minutes >= 6000) return `${count(minutes / 60)} h`;
    return minutes % 60 ? `${Math.floor(minutes / 60)} h ${minutes % 60} min` : `${minutes / 60} h`;
  }

  // "12.3 ms", "0.25 ms"
  function milliseconds(number) {
    if (number === null || number === undefined) return "";
    if (number >= 1000) return duration(number / 1000);
    return `${number >= 100 ? Math.round(number) : Number(number.toPrecision(3))} ms`;
  }

  const LAST = 8.64e12 - 86400; // seconds: dates end a day later
  const possible = (time) => Math.min(LAST, Math.max(-LAST, time)); // a program may have chosen it
  // The device's clock at a time, as a date whose UTC fields are those of that clock.
  function local(time) {
    let offset = data.offsets[0][1];
    for (const [from, seconds] of data.offsets) if (from <= time) offset = seconds;
    return new Date((possible(time) + offset) * 1000);
  }
  const inUtc = (options) => new Intl.DateTimeFormat("en-GB", { ...options, timeZone: "UTC" });
  const dayText = inUtc({ day: "numeric", month: "short", year: "numeric" });
  const shortDayText = inUtc({ weekday: "short", day: "numeric", month: "short" });
  const minuteText = inUtc({ day: "numeric", month: "short", year: "numeric", hour: "2-digit", minute: "2-digit", hourCycle: "h23" });
  const secondText = inUtc({ day: "numeric", month: "short", year: "numeric", hour: "2-digit", minute: "2-digit", second: "2-digit", hourCycle: "h23" });
  const at = (time) => (time === null || time === undefined ? "" : secondText.format(local(time)));
  const atMinute = (time) => minuteText.format(local(time));
  // The ticks of a time axis: where the device's clock shows round times, at most about `most` of them. The axis itself is in UTC,
  // so that an hour that comes twice on the clock is there twice, and nothing is drawn backwards.
  const STEP_SECONDS = [1, 2, 5, 10, 15, 30, 60, 120, 300, 600, 900, 1800, 3600, 7200, 10800, 21600, 43200, 86400, 172800, 259200, 345600, 604800, 1209600];
  const STEP_MONTHS = [1, 2, 3, 6, 12, 24, 60, 120, 240, 1200, 6000, 12000, 60000, 1200000];
  function ticksOf(from, until, most) {
    const span = until - from;
    const seconds = STEP_SECONDS.find((step) => span / step <= most);
    const months = STEP_MONTHS.find((step) => span / (step * 30 * 86400) <= most) ?? 1200000;
    const clocks = (begin, end) => {
      const found = [];
      const monday = seconds >= 604800 ? 4 * 86400 : 0;
      if (seconds) for (let clock = Math.ceil((begin - monday) / seconds) * seconds + monday; clock < end; clock += seconds) found.push(clock);
      else {
        const first = new Date(begin * 1000);
        for (let month = Math.floor((first.getUTCFullYear() * 12 + first.getUTCMonth()) / months) * months; ; month += months) {
          const clock = Date.UTC(Math.floor(month / 12), month % 12, 1) / 1000;
          if (!(clock < end)) break;
          if (clock >= begin) found.push(clock);
        }
      }
      return found;
    };
    const ticks = [];
    data.offsets.forEach(([since, offset], i) => {
      const begin = Math.max(from, i ? since : -Infinity);
      const end = Math.min(until, data.offsets[i + 1]?.[0] ?? Infinity);
      if (begin >= end) return;
      for (const clock of clocks(begin + offset, end + offset)) {
        const last = ticks.length ? ticks[ticks.length - 1] / 1000 : -Infinity;
        if (clock - offset - last > (seconds ?? months * 30 * 86400) * 0.6) ticks.push(new Date((clock - offset) * 1000));
      }
    });
    const day = inUtc({ day: "numeric", month: "short" });
    const clock = inUtc({ hour: "2-digit", minute: "2-digit", hourCycle: "h23", ...(seconds < 60 ? { second: "2-digit" } : {}) });
    const texts = ticks.map((tick, i) => {
      const shown = local(tick / 1000);
      if (seconds < 86400) return i === 0 || shown % 86400000 === 0 ? `${clock.format(shown)}\n${day.format(shown)}` : clock.format(shown);
      const isNewYear = i === 0 || shown.getUTCFullYear() !== local(ticks[i - 1] / 1000).getUTCFullYear();
      if (seconds) return isNewYear ? `${day.format(shown)}\n${shown.getUTCFullYear()}` : day.format(shown);
      const month = inUtc({ month: "short" }).format(shown);
      if (months >= 12) return String(shown.getUTCFullYear());
      return isNewYear ? `${month}\n${shown.getUTCFullYear()}` : month;
    });
    return { ticks, tickFormat: (_, i) => texts[i] };
  }
  // The second time is shorter on the same day. Times within a minute have their seconds.
  function between(from, until) {
    const text = atMinute(from) === atMinute(until) ? secondText : minuteText;
    const isSameDay = dayText.format(local(from)) === dayText.format(local(until));
    return `${text.format(local(from))} to ${text.format(local(until)).split(isSameDay ? ", " : "\0").pop()}`;
  }

  // ---- Elements

  // Children are texts or elements.
  function el(tag, attributes, ...children) {
    const made = document.createElement(tag);
    for (const [name, value] of Object.entries(attributes ?? {})) if (value !== undefined) made.setAttribute(name, value);
    made.append(...children.filter((child) => child !== null));
    return made;
  }
  // [{column: value}] of {"columns": [...], "rows": [[...]]}
  const rowsOf = (list) => list.rows.map((row) => Object.fromEntries(list.columns.map((name, i) => [name, row[i]])));
  const shortened = (text, most) => (text.length <= most ? text : `${text.slice(0, Math.max(1, most - 1))}…`);
  const sum = (rows, value) => rows.reduce((all, row) => all + (value(row) ?? 0), 0);

  const MOST_TABLE_ROWS = 400;
  const MOST_LETTERS = 100; // of a name
  // columns: [heading, cell(row), isNumber, letters]; letters: of a cell, MOST_LETTERS when not given
  function table(columns, rows) {
    const head = el("tr", {}, ...columns.map(([heading, , isNumber]) => el("th", { scope: "col", class: isNumber ? "number" : "" }, heading)));
    const body = rows.slice(0, MOST_TABLE_ROWS).map((row) =>
      el("tr", {}, ...columns.map(([, cell, isNumber, letters]) => el("td", { class: isNumber ? "number" : "" }, shortened(String(cell(row) ?? ""), letters ?? MOST_LETTERS)))));
    const made = el("div", { class: "scroll", tabindex: "0", role: "region", "aria-label": "Table" },
      el("table", {}, el("thead", {}, head), el("tbody", {}, ...body)));
    if (rows.length <= MOST_TABLE_ROWS) return made;
    return el("div", {}, made, el("p", { class: "quiet" }, `The table has the first ${MOST_TABLE_ROWS} of ${count(rows.length)} rows.`));
  }

  const empty = (text) => el("p", { class: "empty" }, text);
  const legend = (entries) =>
    el("ul", { class: "legend" }, ...entries.map(([text, colour, kind]) => {
      const mark = el("i", { class: kind ?? "", "aria-hidden": "true" });
      mark.style.background = colour;
      return el("li", {}, mark, shortened(text, MOST_LETTERS / 2));
    }));

  let pictures = [];
  let pictureNumber = 0;

  // A picture with its title, what it shows in words, and its numbers as a table. draw(width) returns an SVG element.
  function figure({ id, title, about, draw, columns, rows, legendOf, emptyText }) {
    const caption = el("figcaption", {}, el("h3", {}, title), about ? el("p", {}, about) : null);
    if (!draw) return el("figure", { id }, caption, empty(emptyText));
    const number = ++pictureNumber;
    const box = el("div", { class: "picture" });
    const picture = {
      box,
      redraw(width) {
        const svg = draw(width);
        const name = document.createElementNS("http://www.w3.org/2000/svg", "title");
        name.id = `picture-${number}-title`;
        name.textContent = title;
        const text = document.createElementNS("http://www.w3.org/2000/svg", "desc");
        text.id = `picture-${number}-text`;
        text.textContent = about ?? title;
        svg.prepend(name, text);
        svg.setAttribute("role", "img");
        svg.setAttribute("aria-labelledby", name.id);
        svg.setAttribute("aria-describedby", text.id);
        box.replaceChildren(svg);
        return svg;
      },
    };
    pictures.push(picture);
    return el("figure", { id }, caption, box, legendOf ? legend(legendOf) : null,
      el("details", {}, el("summary", {}, "Numbers as a table"), table(columns, rows)));
  }

  // Gives each element of a mark the values of its datum as data attributes.
  const tagged = (rows, options, attributes) => ({
    ...options,
    render(index, scales, values, dimensions, context, next) {
      const group = next(index, scales, values, dimensions, context);
      let inner = group;
      while (inner.children.length === 1 && inner.firstElementChild.tagName === "g") inner = inner.firstElementChild; // clipped marks
      [...inner.children].forEach((child, i) => {
        for (const [name, value] of Object.entries(attributes(rows[index[i]]))) if (value !== undefined) child.setAttribute(`data-${name}`, value);
      });
      return group;
    },
  });

  // ---- What the data say at once

  let played, totals, session, overloaded, culprits, isEmpty;
  const colours = new Map(); // a device has the same colour in every picture, and keeps it
  const MOST_COLOURS = 7;
  function colour(name) {
    if (colours.size < MOST_COLOURS && !colours.has(name)) colours.set(name, `var(--c${colours.size + 1})`);
  }
  function derive() {
    played = rowsOf(data.playing.byDevice.top);
    for (const { name } of played) colour(named(name));
    totals = data.totals;
    session = data.session;
    overloaded = rowsOf(data.issues.byBuffer);
    culprits = rowsOf(data.glitches.top).filter(({ culprit }) => culprit !== null);
    const { buckets, states, values } = data.drivers;
    isEmpty = totals.sessions + totals.playSeconds + totals.inputSeconds + totals.overloads + totals.otherIssues + totals.hapticsEvents + totals.hapticsLeaks === 0
      && buckets.rows.length + states.rows.length + values.rows.length === 0;
  }
  derive();

  const colourOf = (device) => colours.get(named(device)) ?? "var(--c8)";
  function deviceLegend(rows) {
    const used = new Set(rows.map(({ device }) => named(device)));
    const entries = [...colours].filter(([name]) => used.has(name));
    const others = [...used].some((name) => !colours.has(name));
    return others ? [...entries, ["other devices", "var(--c8)"]] : entries;
  }

  // ---- The beginning: which device, which time, what matters

  function heading() {
    const device = data.device?.name ? `${data.device.name} (${data.device.host})` : data.device?.host || "this device";
    const title = session ? `Audio session #${session.id} on ${device}` : `Audio report of ${device}`;
    document.title = title;
    const filter = data.filter ?? {};
    const limits = filter.application ? `Only applications that fit “${filter.application}”. ` : "";
    const time = isEmpty ? "" : `${between(data.from, data.until)}, by the device's clock (${data.zone || "UTC"}). `;
    return el("header", {}, el("h1", {}, title), el("p", { class: "quiet" }, `${time}${limits}${data.live ? "" : `Made on ${atMinute(data.generated)}.`}`));
  }

  // Whether sessions played at the same time, so that the sum of their times is not that of the device.
  const overlaps = () => !session && totals.overlapSeconds > totals.playSeconds / 100;

  // What a reader must know, in whole sentences.
  function findings() {
    const said = [];
    if (isEmpty) return [session ? "The store has nothing else about this session." : "Nothing was recorded in this time: no session, no playing time, no issue."];
    const [application] = rowsOf(data.playing.byApplication.top);
    const [device] = played;
    const chosen = data.filter?.application;
    if (application && totals.playSeconds > 0) {
      const shareOf = (row) => {
        const share = row.seconds / totals.playSeconds;
        if (share <= 0.995) return `${percent(share)} of it`;
        return share > 0.99999 ? "all of it" : "nearly all of it";
      };
      const time = duration(totals.playSeconds);
      if (session) said.push(`It played ${time}, ${shareOf(device)} on ${named(device.name)}.`);
      else said.push(`${overlaps() ? `The sessions played ${time} added up, in ${duration(totals.playingSeconds)} of the device's time` : `${chosen ? `What fits “${chosen}”` : "The device"} played ${time}`}, ${shareOf(application)} for ${named(application.name)} and ${shareOf(device)} on ${named(device.name)}.`);
    } else {
      said.push(data.live ? "The store has no playing time yet." : "No playback was recorded.");
    }
    if (totals.overloads > 0) {
      const worst = [...overloaded].sort((a, b) => b.count - a.count)[0];
      const buffer = worst.frames === null ? "" : `; ${worst.count === totals.overloads ? "all" : percent(worst.count / totals.overloads)} of them with a buffer of ${count(worst.frames)} frames`;
      said.push(`The audio overloaded ${many(totals.overloads, "time", "times")}${session || totals.overloadedSessions === 0 ? "" : ` in ${many(totals.overloadedSessions, "session", "sessions")}`}${buffer}.`);
    } else {
      said.push("No overload was recorded.");
    }
    if (culprits.length) {
      const [first, second] = culprits;
      const share = (row) => `${count(row.count)} (${percent(row.count / data.glitches.count)})`;
      said.push(`Of ${many(data.glitches.count, "glitch", "glitches")}, ${named(first.culprit)} caused ${share(first)}${second ? `, and ${named(second.culprit)} ${share(second)}` : ""}.`);
    }
    if (totals.otherIssues > 0) {
      const kinds = rowsOf(data.issues.byKind).filter(({ kind }) => kind !== "overload").map((row) => `${named(row.kind)} (${count(row.count)})`);
      said.push(`Other issues: ${kinds.join(", ")}.`);
    }
    if (totals.hapticsLeaks > 0) said.push(`The haptics engine stayed on without a client: ${many(totals.hapticsLeaks, "time", "times")}, together ${duration(totals.leakedSeconds)}.`);
    const broken = totals.interrupted + totals.disconnected;
    if (broken > 0 && !session) {
      const causes = [totals.disconnected > 0 ? `${many(totals.disconnected, "client", "clients")} disconnected` : "",
        totals.interrupted > 0 ? `${many(totals.interrupted, "was", "were")} interrupted because the daemon or the device ended` : ""];
      said.push(`${many(broken, "session", "sessions")} ended without a stop: ${causes.filter(Boolean).join(", ")}.`);
    }
    if (data.daemon) said.push(daemonSentence());
    return said;
  }

  function daemonSentence() {
    const { answers, reason, refused, sinks, tellsSinks, linesHeldBack } = data.daemon;
    if (!answers) return `No daemon answered when this page was made (${reason}), so the page cannot say what was dropped or refused.`;
    const dropped = sum(sinks, (sink) => sink.dropped);
    const hanging = sinks.filter((sink) => sink.hangs > 0).map((sink) => sink.sink);
    const parts = [];
    if (dropped > 0) parts.push(`dropped ${many(dropped, "report", "reports")}`);
    if (refused.length > 0) parts.push(`refused requests ${many(sum(refused, (row) => row.times), "time", "times")}`);
    if (hanging.length > 0) parts.push(`has sinks that hang (${hanging.join(", ")})`);
    if (linesHeldBack > 0) parts.push(`kept ${many(linesHeldBack, "line", "lines")} out of its log`);
    const all = tellsSinks ? "" : " Only trusted users are told what it dropped, and what it refused to others.";
    if (parts.length) return `Since it began, the daemon ${parts.join(", ")}.${all}`;
    return tellsSinks ? "The daemon answers. Since it began it dropped and refused nothing." : `The daemon answers. Since it began it refused nothing of the user who made this page.${all}`;
  }

  function overloadRate() {
    if (totals.overloads === 0) return "none was recorded";
    if (totals.playSeconds < 3600) return `in ${duration(totals.playSeconds)} played`;
    const rate = totals.overloads / totals.playSeconds * 3600;
    return `${rate < 10 ? rate.toPrecision(2) : count(rate)} an hour played`;
  }

  function numbers() {
    const tile = (label, value, note, isBad) => el("li", { class: isBad ? "bad" : "" }, el("span", { class: "label" }, label), el("b", {}, value), el("span", {}, note));
    const tiles = [];
    if (!session) tiles.push(tile("Sessions", count(totals.sessions), totals.running ? `${count(totals.running)} ${daemonAnswers() ? `still ${totals.running === 1 ? "runs" : "run"}` : "without an end"}` : `of ${many(totals.applications, "application", "applications")}`));
    tiles.push(tile("Played", duration(totals.playSeconds), overlaps() ? `added up, in ${duration(totals.playingSeconds)} of time` : `on ${many(totals.devices, "device", "devices")}`));
    tiles.push(tile("Average volume", totals.averageVolume === null ? UNKNOWN : percent(totals.averageVolume), "weighted by time"));
    tiles.push(tile("Overloads", count(totals.overloads), overloadRate(), totals.overloads > 0));
    tiles.push(tile("Input", duration(totals.inputSeconds), "microphones and other inputs"));
    tiles.push(tile("Haptics", duration(totals.hapticsSeconds), `${many(totals.hapticsEvents, "event", "events")}${totals.hapticsEvents ? ", taken as seconds" : ""}`));
    if (totals.messages > 0) tiles.push(tile("Messages", count(totals.messages), `${percent(totals.redundantMessages / totals.messages)} said nothing new${data.filter?.since === undefined && data.filter?.until === undefined ? "" : "; of whole sessions"}`));
    return el("ul", { class: "numbers" }, ...tiles);
  }

  // ---- What runs now

  // The newest state of `twctl serve`, and when it came by the browser's clock; null before the first, and on a page that is not live.
  let state = null;
  const SAME_START = 3; // seconds: the daemon and the store date a session's start a little differently
  const nowAt = () => (state ? state.now + (performance.now() - state.came) / 1000 : data.generated);
  // Up to here the stretches grow. What happens while the daemon does not answer, nobody knows.
  const grownUntil = () => (state.answers ? nowAt() : state.lost);

  // The sessions that run, or that ended a moment ago, with their stretches, as rows of the timeline.
  function running() {
    const sessions = [];
    const stretches = [];
    if (!state) return { sessions, stretches };
    const stored = rowsOf(data.timeline.lanes);
    // Clients may use the same identifier at the same time. An application may change its name while its session runs.
    const fits = (row, one) => row.reporter === one.reporter && row.started !== null && Math.abs(row.started - one.started) < SAME_START;
    const isOf = (row, one) => fits(row, one) && (row.application ?? "") === one.application;
    for (const one of state.sessions) {
      const row = stored.find((each) => isOf(each, one)) ?? stored.find((each) => fits(each, one) && !state.sessions.some((other) => isOf(each, other)));
      if (row && row.ended !== null) continue; // the store has all of it
      if (session && (!row || row.id !== session.id)) continue;
      const id = row ? row.id : `now-${one.reporter}-${Math.round(one.started)}`;
      const own = one.stretches.map(([started, ended, volume, device, ringer]) => ({ session: id, started, ended: ended ?? Math.max(started, grownUntil()), volume, device, ringer, isOpen: ended === null }));
      for (const { device } of own) colour(named(device));
      stretches.push(...own);
      sessions.push({ ...row, id, service: one.service, application: one.application, process: one.processName, started: row ? row.started : one.started, ended: one.ended,
        ending: null, overloads: row ? row.overloads : 0, playSeconds: sum(own, (stretch) => stretch.ended - stretch.started), runs: true });
    }
    return { sessions, stretches };
  }

  // ---- The timeline

  // The heights of a lane's parts, in pixels. On paper they are smaller, so that the timeline fits below the numbers.
  const SCREEN = { label: 17, band: 5, volume: 32, below: 14 };
  const PRINT = { label: 15, band: 4, volume: 16, below: 11 };
  let isPrinting = false;
  const MOST_LANES = 24;
  const MOST_LANES_OF_APPLICATION = 4;

  // Only a daemon that answers knows that a session without an end runs.
  const daemonAnswers = () => (state ? state.answers : data.daemon?.answers === true);
  const noEnd = () => (daemonAnswers() ? "still runs" : "no end recorded");

  // A session that the store does not have yet has no number.
  const nameOfSession = (one) => `${named(one?.application)}${typeof one?.id === "number" ? ` #${one.id}` : ""}`;

  // "Studio: late at 20 Nov 2026, 12:00:00, 3 ms beyond the deadline; heard by Melody"
  const glitchText = (row) => [`${row.culprit === null ? "Not known whose" : row.culprit}: ${named(row.cause)} at ${at(row.at)}`, row.over === null ? "" : `, ${milliseconds(row.over)} beyond the deadline`,
    row.lost === null ? "" : `, ${milliseconds(row.lost)} lost`, row.times > 1 ? `, ${count(row.times)} times within a second` : "", `; heard by ${named(row.heard)}`].join("");

  // The lanes with their sessions: one a session, or one an application, and more for its sessions at the same time.
  function lanesOf(sessions, mode) {
    if (mode === "session") {
      const weight = (one) => (one.runs ? 1e12 : 0) + one.playSeconds + one.overloads;
      const longest = [...sessions].sort((a, b) => weight(b) - weight(a)).slice(0, MOST_LANES);
      return longest.sort((a, b) => a.started - b.started).map((one) => ({
        label: `${nameOfSession(one)}${one.overloads ? `, ${many(one.overloads, "overload", "overloads")}` : ""}`, sessions: [one] }));
    }
    const lanes = [];
    for (const one of [...sessions].sort((a, b) => a.started - b.started)) {
      const application = named(one.application);
      const taken = lanes.filter((lane) => lane.application === application);
      const free = taken.find((lane) => lane.until <= one.started);
      if (!free && taken.length === MOST_LANES_OF_APPLICATION) continue;
      const lane = free ?? { application, sessions: [], seconds: 0 };
      if (!free) lanes.push(lane);
      lane.sessions.push(one);
      lane.until = one.ended ?? Math.max(data.until, nowAt());
    }
    const seconds = new Map();
    for (const lane of lanes) seconds.set(lane.application, (seconds.get(lane.application) ?? 0) + sum(lane.sessions, (one) => one.playSeconds + (one.runs ? 1e12 : 0)) + 1);
    lanes.sort((a, b) => seconds.get(b.application) - seconds.get(a.application) || (a.application < b.application ? -1 : a.application > b.application ? 1 : 0));
    const before = new Map();
    for (const lane of lanes) {
      const place = (before.get(lane.application) ?? 0) + 1;
      before.set(lane.application, place);
      lane.label = place === 1 ? lane.application : `${lane.application}, at the same time (${place})`;
    }
    return lanes.slice(0, MOST_LANES);
  }

  function timeline() {
    const LEAST_SHOWN = 60; // seconds, of a live page
    const LIVE_PAD = 5; // seconds: what comes would be an empty picture
    let sessions, stretches, inputs, issues, glitches, haptics, hours, byId, all, pad;
    function read() {
      const now = running();
      const runs = new Set(now.sessions.map(({ id }) => id));
      sessions = [...rowsOf(data.timeline.lanes).filter(({ id, started }) => started !== null && !runs.has(id)), ...now.sessions];
      stretches = [...rowsOf(data.timeline.played).filter((row) => !runs.has(row.session)).map((row) => ({ ...row, ended: row.ended ?? row.started })), ...now.stretches];
      inputs = rowsOf(data.timeline.heard).map((row) => ({ ...row, ended: row.ended ?? row.started }));
      issues = rowsOf(data.timeline.issues);
      glitches = rowsOf(data.timeline.glitches);
      haptics = rowsOf(data.timeline.haptics);
      hours = session || data.until - data.from < 4 * 3600 ? [] : data.hours.map(([from, seconds, , until]) => ({ from, seconds, until }));
      byId = new Map(sessions.map((one) => [one.id, one]));
      const until = session && session.ended !== null ? data.until : Math.max(data.until, state ? nowAt() : 0);
      const from = Math.min(data.from, ...now.sessions.map(({ started }) => started), state ? until - LEAST_SHOWN : data.from);
      pad = Math.min(data.live ? LIVE_PAD : 1800, Math.max(1, (until - from) * 0.005));
      all = [from - pad, until + pad];
    }
    read();
    const title = session ? "The session over time" : "Sessions over time";
    const isNothing = () => sessions.length === 0 && haptics.length === 0;
    if (isNothing()) {
      const made = figure({ id: "timeline", title, emptyText: "No session was open in this time." });
      made.update = () => {
        read();
        return isNothing();
      };
      return made;
    }
    let mode = session || sessions.length <= 12 ? "session" : "application";
    let shown = [0, 1]; // the visible part of `all`
    const isWhole = () => shown[1] - shown[0] > 0.999;
    const isAtEnd = () => data.live && shown[1] > 0.999;
    // A live page begins with the last hour, so that one sees something move, unless the last thing that happened is longer ago.
    const FIRST_SHOWN = 3600;
    let hasBegun = false;
    function begin() {
      const isOld = !sessions.some(({ runs }) => runs) && all[1] - data.until > FIRST_SHOWN;
      shown = all[1] - all[0] > 2 * FIRST_SHOWN && !isOld ? [1 - (FIRST_SHOWN + pad) / (all[1] - all[0]), 1] : [0, 1];
    }
    let lanes = [];
    const margin = { left: 6, right: 10 };

    const columns = [
      ["Session", (row) => (typeof row.id === "number" ? `#${row.id}` : "runs")], ["Application", (row) => named(row.application)], ["Service", (row) => named(row.service)],
      ["Started", (row) => at(row.started)], ["Ended", (row) => (row.ended === null ? noEnd() : at(row.ended))],
      ["Ending", (row) => row.ending ?? ""], ["Played", (row) => duration(row.playSeconds), true], ["Overloads", (row) => count(row.overloads), true],
    ];

    function draw(width) {
      const { label: LABEL, band: BAND, volume: VOLUME, below: BELOW } = isPrinting ? PRINT : SCREEN;
      const LANE = LABEL + BAND + VOLUME + BELOW;
      const size = width - margin.left - margin.right;
      const span = all[1] - all[0];
      const from = all[0] + shown[0] * span;
      const until = all[0] + shown[1] * span;
      const least = (until - from) / size * 1.5; // nothing is thinner than this, so that a short sound can be seen
      const inside = (started, ended) => ended >= from && started <= until;
      const endOf = (row) => row.ended ?? Math.max(data.until, state ? grownUntil() : 0);
      lanes = lanesOf(sessions, mode);
      const top = hours.length ? LABEL + VOLUME + 8 : 0;
      const laneOf = new Map(lanes.flatMap((lane, i) => lane.sessions.map((one) => [one.id, i])));
      const topOf = (id) => top + laneOf.get(id) * LANE + LABEL;
      const baseOf = (id) => topOf(id) + BAND + VOLUME;
      const hasLane = (row) => laneOf.has(row.session ?? row.id);
      const glitchTop = top + lanes.length * LANE;
      const hapticsTop = glitchTop + (glitches.length ? LABEL + 22 : 0);
      const height = hapticsTop + (haptics.length ? LABEL + 22 : 0);
      const most = Math.max(1, ...hours.map(({ seconds }) => seconds));
      const x = (time) => new Date(possible(time) * 1000);
      const axis = ticksOf(from, until, Math.max(2, Math.round(size / 90)));
      const wide = (started, ended) => x(Math.max(ended, started + least));

      const lives = sessions.filter((row) => hasLane(row) && inside(row.started, endOf(row)));
      const runs = stretches.filter((row) => hasLane(row) && inside(row.started, row.ended));
      const rings = runs.filter((row) => row.ringer === 1);
      const hears = inputs.filter((row) => hasLane(row) && inside(row.started, row.ended));
      const marks = issues.filter((row) => hasLane(row) && inside(row.at, row.at));
      const overloads = marks.filter((row) => row.kind === "overload");
      const others = marks.filter((row) => row.kind !== "overload");
      const crackled = glitches.filter((row) => inside(row.at, row.at));
      const felt = haptics.filter((row) => inside(row.at, row.at));
      const visible = hours.filter((row) => inside(row.from, row.until));
      const nameOf = (row) => nameOfSession(byId.get(row.session ?? row.id));
      // The line would hide the area of a stretch that is hardly wider.
      const isNarrow = (row) => (row.ended - row.started) / (until - from) * size < 3;
      // The step line of the volume: two points a stretch, and none between stretches that do not touch.
      const steps = [];
      for (const row of runs) {
        if (isNarrow(row)) continue;
        const last = steps[steps.length - 1];
        if (last && (last.session !== row.session || row.started - last.time > 1)) steps.push({ session: row.session, time: row.started, volume: null });
        steps.push({ session: row.session, time: row.started, volume: row.volume }, { session: row.session, time: row.ended, volume: row.volume });
      }
      const heightOf = (id, volume) => baseOf(id) - VOLUME * Math.min(1, Math.max(0, volume ?? 0));
      const labels = lanes.map((lane, i) => ({ y: top + i * LANE + LABEL - 5, text: lane.label }));
      if (hours.length) labels.unshift({ y: LABEL - 5, text: "All sessions: time played in each hour, added up" });
      if (glitches.length) labels.push({ y: glitchTop + LABEL - 5, text: "Glitches, and whose they were" });
      if (haptics.length) labels.push({ y: hapticsTop + LABEL - 5, text: "Haptics" });
      const letters = Math.min(MOST_LETTERS, Math.floor(size / 7.4));

      const svg = plot({
        width, height: height + 34, marginLeft: margin.left, marginRight: margin.right, marginTop: 2, marginBottom: 28,
        x: { type: "utc", domain: [x(from), x(until)], label: null },
        y: { type: "linear", domain: [0, height], range: [2, 2 + height], axis: null },
        marks: [
          charts.axisX({ ...axis, tickSize: 4 }),
          charts.gridX({ ticks: axis.ticks, stroke: "var(--line)", strokeOpacity: 1 }),
          charts.rect(visible, tagged(visible, { x1: (d) => x(d.from), x2: (d) => x(d.until), y1: (d) => LABEL + VOLUME - VOLUME * d.seconds / most,
            y2: LABEL + VOLUME, fill: "var(--c8)", clip: true, title: (d) => `${atMinute(d.from)}: ${duration(d.seconds)} played in this hour, added up over sessions` },
          (d) => ({ mark: "hour", from: d.from, seconds: d.seconds }))),
          charts.ruleY(lanes.map((_, i) => top + i * LANE), { stroke: "var(--line)" }),
          charts.rect(lives, tagged(lives, { x1: (d) => x(d.started), x2: (d) => wide(d.started, endOf(d)), y1: (d) => baseOf(d.id), y2: (d) => baseOf(d.id) + 2,
            fill: "var(--quiet)", clip: true, title: (d) => `${nameOf(d)}, ${at(d.started)} to ${d.ended === null ? noEnd() : at(d.ended)}` },
          (d) => ({ mark: "session", session: d.id, started: d.started, ended: endOf(d) }))),
          charts.rect(runs, tagged(runs, { x1: (d) => x(d.started), x2: (d) => x(d.ended), y1: (d) => heightOf(d.session, d.volume), y2: (d) => baseOf(d.session),
            fill: (d) => colourOf(d.device), fillOpacity: (d) => (isNarrow(d) ? 0.9 : 0.3), clip: true,
            title: (d) => `${nameOf(d)}: ${named(d.device)} at ${percent(d.volume) || "unknown volume"}, ${duration(d.ended - d.started)} from ${at(d.started)}` },
          (d) => ({ mark: "stretch", session: d.session, started: d.started, ended: d.ended, volume: d.volume, open: d.isOpen ? "yes" : undefined }))),
          charts.line(steps, { x: (d) => x(d.time), y: (d) => (d.volume === null ? NaN : heightOf(d.session, d.volume)), z: "session", stroke: "var(--ink)", strokeWidth: 1.25, clip: true }),
          charts.rect(runs, tagged(runs, { x1: (d) => x(d.started), x2: (d) => wide(d.started, d.ended), y1: (d) => topOf(d.session), y2: (d) => topOf(d.session) + BAND,
            fill: (d) => colourOf(d.device), clip: true }, (d) => ({ mark: "device", device: named(d.device) }))),
          charts.rect(rings, tagged(rings, { x1: (d) => x(d.started), x2: (d) => wide(d.started, d.ended), y1: (d) => baseOf(d.session) + 3, y2: (d) => baseOf(d.session) + 6, fill: "var(--bell)", clip: true },
            (d) => ({ mark: "ringer", session: d.session }))),
          charts.rect(hears, tagged(hears, { x1: (d) => x(d.started), x2: (d) => wide(d.started, d.ended), y1: (d) => baseOf(d.session) + 7, y2: (d) => baseOf(d.session) + 10, fill: "var(--input)", clip: true,
            title: (d) => `${nameOf(d)}: input from ${named(d.device)}, ${duration(d.ended - d.started)}` }, (d) => ({ mark: "input", session: d.session }))),
          charts.ruleX(overloads, tagged(overloads, { x: (d) => x(d.at), y1: (d) => topOf(d.session) + BAND, y2: (d) => baseOf(d.session), stroke: "var(--bad)", strokeWidth: 1.5,
            title: (d) => `${nameOf(d)}: overload at ${at(d.at)}, ${duration(d.seconds)}` }, (d) => ({ mark: "overload", session: d.session, at: d.at }))),
          charts.dot(others, tagged(others, { x: (d) => x(d.at), y: (d) => baseOf(d.session) - VOLUME / 2, symbol: "diamond", r: 4, fill: "var(--ink)",
            title: (d) => `${nameOf(d)}: ${named(d.kind)} at ${at(d.at)}` }, (d) => ({ mark: "issue", session: d.session, kind: named(d.kind) }))),
          charts.ruleX(crackled, tagged(crackled, { x: (d) => x(d.at), y1: glitchTop + LABEL, y2: glitchTop + LABEL + 16, strokeWidth: 1.5, stroke: (d) => (d.culprit === null ? "var(--c8)" : "var(--bad)"),
            title: glitchText }, (d) => ({ mark: "glitch", at: d.at, culprit: named(d.culprit), cause: named(d.cause) }))),
          charts.ruleX(felt, tagged(felt, { x: (d) => x(d.at), y1: hapticsTop + LABEL, y2: hapticsTop + LABEL + 16, stroke: "var(--c4)", strokeOpacity: 0.7,
            title: (d) => `${named(d.application)}: ${duration(d.seconds)} at ${at(d.at)}` }, (d) => ({ mark: "haptics", at: d.at }))),
          charts.text(labels, { frameAnchor: "left", y: "y", text: (d) => shortened(d.text, letters), textAnchor: "start", dx: 2, fill: "var(--ink)", stroke: "var(--page)", strokeWidth: 4 }),
        ],
      });
      svg.dataset.from = from;
      svg.dataset.until = until;
      svg.dataset.left = margin.left;
      svg.dataset.right = width - margin.right;
      return svg;
    }

    const legendNow = () => [...deviceLegend(stretches), ["volume", "var(--ink)", "thin"], ["ringer on", "var(--bell)", "thin"], ["input", "var(--input)", "thin"], [glitches.length ? "overload, glitch" : "overload", "var(--bad)", "tick"],
      ...(glitches.some(({ culprit }) => culprit === null) ? [["glitch, not known whose", "var(--c8)", "tick"]] : []),
      ...(issues.some(({ kind }) => kind !== "overload") ? [["other issue (diamond)", "var(--ink)", "tick"]] : []), ...(haptics.length ? [["haptics", "var(--c4)", "tick"]] : [])];
    const made = figure({
      id: "timeline", title, columns, rows: sessions, draw,
      about: `The band on top of a lane is the device, the line and the area under it the volume from silent to full. A grey line lasts as long as the session is open.`,
      legendOf: legendNow(),
    });
    const picture = pictures[pictures.length - 1];
    const box = picture.box;
    const says = el("span", { "aria-live": "polite", class: "shows" });
    box.classList.add("zoomable");
    box.tabIndex = 0;
    box.setAttribute("role", "group");
    box.setAttribute("aria-label", "Timeline. Plus and minus zoom, the arrow keys move, 0 shows everything.");

    // The zoom moves over the plain picture's pixels; its transform and `shown` say the same.
    const zoom = charts.zoom().scaleExtent([1, 20000]);
    const target = select(box);
    let waits = false;
    let isMoved = false; // by a hand or a wheel, at this moment
    const inner = () => Math.max(50, (picture.width ?? 600) - margin.left - margin.right);
    const describe = () => {
      const span = all[1] - all[0];
      says.classList.toggle("hint", isWhole());
      let text = `Shows ${between(all[0] + shown[0] * span, all[0] + shown[1] * span)}.`;
      if (isAtEnd()) text = `Shows the last ${duration((shown[1] - shown[0]) * span)}, and what comes.`;
      if (isWhole()) text = "Shows everything.";
      if (says.textContent !== text) says.textContent = text; // a screen reader reads it again when it is set
    };
    const setTransform = () => {
      const scale = 1 / (shown[1] - shown[0]);
      const begin = margin.left + shown[0] * inner();
      target.property("__zoom", charts.zoomIdentity.translate(margin.left - scale * begin, 0).scale(scale));
    };
    const redraw = picture.redraw;
    picture.redraw = (width) => {
      picture.width = width - 10; // the box's border and padding
      zoom.extent([[margin.left, 0], [margin.left + inner(), 1]]).translateExtent([[margin.left, 0], [margin.left + inner(), 1]]);
      setTransform();
      describe();
      return redraw(picture.width);
    };
    zoom.filter((event) => (event.type === "wheel" ? event.ctrlKey || event.metaKey || document.activeElement === box : !event.button));
    zoom.on("start", () => { isMoved = true; });
    zoom.on("end", () => { isMoved = false; });
    zoom.on("zoom", ({ transform }) => {
      const places = [margin.left, margin.left + inner()].map((place) => (transform.invertX(place) - margin.left) / inner());
      shown = [Math.max(0, places[0]), Math.min(1, places[1])];
      if (waits) return;
      waits = true;
      requestAnimationFrame(() => {
        waits = false;
        describe();
        redraw(picture.width);
      });
    });
    target.call(zoom);
    const by = (factor) => zoom.scaleBy(target, factor);
    const move = (part) => zoom.translateBy(target, -part * inner() * (shown[1] - shown[0]), 0);
    const show = (from, until) => {
      shown = [Math.max(0, from), Math.min(1, until)];
      setTransform();
      describe();
      redraw(picture.width);
    };
    box.addEventListener("keydown", (event) => {
      const keys = { "+": () => by(1.6), "=": () => by(1.6), "-": () => by(1 / 1.6), ArrowLeft: () => move(-0.25), ArrowRight: () => move(0.25), 0: () => show(0, 1), Home: () => show(0, 1) };
      if (event.ctrlKey || event.metaKey || event.altKey || !keys[event.key]) return;
      event.preventDefault();
      keys[event.key]();
    });
    const button = (text, label, act) => {
      const pressed = el("button", { type: "button", "aria-label": label }, text);
      pressed.addEventListener("click", act);
      return pressed;
    };
    const tools = el("div", { class: "tools" }, button("+", "Zoom in", () => by(1.6)), button("−", "Zoom out", () => by(1 / 1.6)),
      button("◀", "Earlier", () => move(-0.5)), button("▶", "Later", () => move(0.5)), button("All", "Show everything", () => show(0, 1)));
    const showLast = (seconds) => show(1 - (seconds + pad) / (all[1] - all[0]), 1);
    if (data.live) tools.append(button("Last minute", "Show the last minute, and what comes", () => showLast(60)), button("Last hour", "Show the last hour, and what comes", () => showLast(3600)));
    if (all[1] - all[0] > 2 * 86400) tools.append(button("Last day", "Show the last day", () => showLast(86400)));
    if (!session && (sessions.length > 1 || data.live)) {
      const choice = el("select", { id: "lanes" }, el("option", { value: "application" }, "application"), el("option", { value: "session" }, "session"));
      choice.value = mode;
      choice.addEventListener("change", () => {
        mode = choice.value;
        note();
        redraw(picture.width);
      });
      tools.append(el("label", { for: "lanes" }, "A lane for each "), choice);
    }
    tools.append(says);
    box.before(tools);
    const left = el("p", { class: "quiet left-out" });
    const note = () => {
      const out = data.timeline.leftOut;
      const missing = [];
      const laned = sum(lanesOf(sessions, mode), (lane) => lane.sessions.length);
      const unlaned = sessions.length - laned;
      if (out.sessions > 0) missing.push(`${many(out.sessions, "session", "sessions")} besides the ${count(data.timeline.lanes.rows.length)} that played longest or overloaded most`);
      if (unlaned > 0) missing.push(`${many(unlaned, "session", "sessions")} for which no lane is free (there are at most ${MOST_LANES}${mode === "session" ? "" : `, and ${MOST_LANES_OF_APPLICATION} for one application`})`);
      if (out.stretches > 0) missing.push(`${many(out.stretches, "short stretch", "short stretches")}`);
      if (out.issues > 0) missing.push(`${many(out.issues, "short issue", "short issues")}`);
      if (out.inputs > 0) missing.push(`${many(out.inputs, "short input", "short inputs")}`);
      if (out.glitches > 0) missing.push(`${many(out.glitches, "short glitch", "short glitches")}`);
      if (out.haptics > 0) missing.push(`${many(out.haptics, "short haptic event", "short haptic events")}`);
      if (out.misplaced > 0) missing.push(`${many(out.misplaced, "stretch", "stretches")} with a time that cannot be`);
      const text = missing.length ? `Left out of the lanes: ${missing.join(", ")}. All other numbers on the page count them.` : "";
      if (left.textContent !== text) left.textContent = text;
    };
    note();
    box.after(left);
    // Takes newer data, or shows that time has passed. What is visible stays, or stays at the end. False when the timeline must be made anew.
    made.update = () => {
      const before = all;
      const wasWhole = isWhole();
      const move = isAtEnd();
      read();
      if (isNothing()) return false;
      const span = all[1] - all[0];
      if (state && !hasBegun) {
        hasBegun = true;
        begin();
      } else if (!wasWhole) {
        const moved = move ? all[1] - (before[0] + shown[1] * (before[1] - before[0])) : 0;
        shown = shown.map((part) => Math.min(1, Math.max(0, (before[0] + part * (before[1] - before[0]) + moved - all[0]) / span)));
      }
      const fresh = legend(legendNow());
      const old = made.querySelector(".legend");
      if (!fresh.isEqualNode(old)) old.replaceWith(fresh);
      const details = made.querySelector("details");
      const rows = table(columns, sessions);
      if (!rows.isEqualNode(details.lastElementChild)) {
        const places = placesIn([details]);
        details.lastElementChild.replaceWith(rows);
        restore([details], places);
      }
      note();
      if (isMoved || waits || picture.width === undefined) return true;
      setTransform();
      describe();
      redraw(picture.width);
      return true;
    };
    box.after(el("p", { class: "quiet hint" }, "Zoom: the wheel after a click or with Ctrl, two fingers, or + and −. Move: drag, or the arrow keys."));
    return made;
  }

  // ---- Loudness by hour

  const MOST_DAYS = 92; // as in ReportData.h, like the other limits
  const STEPS = [0.2, 0.35, 0.5, 0.65, 0.8];
  function heatMap() {
    const DAY = 86400000;
    const cells = data.hours.map(([from, seconds, volume]) => {
      const clock = local(from);
      return { from, seconds, volume, hour: clock.getUTCHours(), day: new Date(Math.floor(clock / DAY) * DAY) };
    });
    const title = "Loudness by hour and day";
    if (cells.length === 0) return figure({ id: "heat", title, emptyText: "No playback was recorded in this time, so there is no loudness to show." });
    const known = cells.filter(({ volume }) => volume !== null);
    const days = [cells[0].day, new Date(+cells[cells.length - 1].day + DAY)];
    const several = (days[1] - days[0]) / DAY;
    const names = ["below 20 %", "20 to 35 %", "35 to 50 %", "50 to 65 %", "65 to 80 %", "80 % and more"];
    return figure({
      id: "heat", title, about: "The average volume of what was played in each hour of the device's clock, weighted by its seconds. An empty cell: nothing was played." + (data.until - data.from > MOST_DAYS * 86400 ? ` The picture has the last ${MOST_DAYS} days.` : ""),
      legendOf: names.map((name, i) => [name, `var(--h${i + 1})`]), rows: cells,
      columns: [["Hour", (row) => atMinute(row.from)], ["Average volume", (row) => percent(row.volume), true], ["Played", (row) => duration(row.seconds), true]],
      draw: (width) => plot({
        width: Math.min(width, 60 + several * 90), height: 24 * (isPrinting ? 8 : 11) + 34, marginLeft: 44, marginRight: 8, marginTop: 6, marginBottom: 28,
        x: { type: "utc", domain: days, label: null, ...(several <= width / 110 ? { ticks: "day", tickFormat: (day) => shortDayText.format(day) } : { ticks: Math.max(2, Math.round(width / 110)) }) },
        y: { domain: [0, 24], range: [6, 6 + 24 * (isPrinting ? 8 : 11)], ticks: [0, 6, 12, 18, 24], tickFormat: (hour) => `${hour}:00`, label: null },
        color: { type: "threshold", domain: STEPS, range: names.map((_, i) => `var(--h${i + 1})`) },
        marks: [
          charts.gridY([0, 6, 12, 18, 24], { stroke: "var(--line)", strokeOpacity: 1 }),
          charts.rect(known, tagged(known, { x1: "day", x2: (d) => new Date(+d.day + DAY), y1: "hour", y2: (d) => d.hour + 1, fill: "volume", inset: 0.5, rx: 1.5,
            title: (d) => `${atMinute(d.from)}: ${percent(d.volume)} on average, ${duration(d.seconds)} played` }, (d) => ({ mark: "cell", from: d.from, volume: d.volume }))),
        ],
      }),
    });
  }

  // ---- Time by application, device and volume

  // The unit in which bars of these seconds are easy to read.
  function unitFor(seconds) {
    if (seconds >= 2 * 3600) return { seconds: 3600, name: "hours" };
    return seconds >= 120 ? { seconds: 60, name: "minutes" } : { seconds: 1, name: "seconds" };
  }

  // bars: [{name, parts: [{device, seconds}], seconds}], longest first
  // `counts`: what `seconds` counts, where it is no time.
  function barFigure({ id, title, about, bars, columns, rows, emptyText, legendOf, counts }) {
    if (bars.length === 0) return figure({ id, title, emptyText });
    const parts = bars.flatMap(({ name, parts: all }) => all.map((part) => ({ ...part, name })));
    const longest = Math.max(...bars.map(({ seconds }) => seconds), 0.001);
    const unit = counts ? { seconds: 1, name: counts } : unitFor(longest);
    const length = counts ? count : duration;
    return figure({
      id, title, about, columns, rows, legendOf,
      draw(width) {
        const left = Math.min(170, Math.max(96, width * 0.28));
        return plot({
          width, height: bars.length * 28 + 40, marginLeft: left, marginRight: 84, marginTop: 4, marginBottom: 34,
          x: { domain: [0, longest / unit.seconds], label: unit.name, ticks: Math.min(counts ? longest : Infinity, Math.max(2, Math.round((width - left - 84) / 70))), labelArrow: "none" },
          y: { type: "band", domain: bars.map(({ name }) => name), label: null, tickFormat: (name) => shortened(name, Math.floor(left / 7.2)), tickSize: 0, padding: 0.25 },
          marks: [
            charts.gridX({ stroke: "var(--line)", strokeOpacity: 1 }),
            charts.barX(parts, tagged(parts, { x: (d) => d.seconds / unit.seconds, y: "name", fill: (d) => d.colour ?? colourOf(d.device), title: (d) => `${d.name}${d.device === undefined ? "" : `, ${named(d.device)}`}: ${length(d.seconds)}` },
              (d) => ({ mark: "bar", name: d.name, seconds: d.seconds }))),
            charts.text(bars, { x: (d) => d.seconds / unit.seconds, y: "name", text: (d) => length(d.seconds), textAnchor: "start", dx: 5, fill: "var(--ink)", stroke: "var(--page)", strokeWidth: 4 }),
          ],
        });
      },
    });
  }

  function byApplication() {
    const { top, rest } = data.playing.byApplication;
    const rows = rowsOf(top);
    const onDevices = rowsOf(data.playing.onDevices);
    const bars = rows.map(({ name, seconds }) => {
      const parts = onDevices.filter(({ application }) => application === name).map(({ device, seconds: part }) => ({ device, seconds: part }));
      const unnamed = seconds - sum(parts, (part) => part.seconds);
      if (unnamed > 0.01) parts.push({ device: "other devices", seconds: unnamed });
      return { name: named(name), seconds, parts };
    });
    if (rest.names > 0) bars.push({ name: many(rest.names, "other", "others"), seconds: rest.seconds, parts: [{ seconds: rest.seconds, colour: "var(--c8)" }] });
    return barFigure({
      id: "by-application", title: "Time by application", about: "How long each application played, and on which devices.", bars, rows, legendOf: deviceLegend(onDevices),
      columns: [["Application", (row) => named(row.name)], ["Played", (row) => duration(row.seconds), true], ["Average volume", (row) => percent(row.averageVolume), true], ["Sessions", (row) => count(row.sessions), true]],
      emptyText: "No playback was recorded in this time.",
    });
  }

  function byDevice() {
    const { rest } = data.playing.byDevice;
    const bars = played.map(({ name, seconds }) => ({ name: named(name), seconds, parts: [{ device: name, seconds }] }));
    if (rest.names > 0) bars.push({ name: many(rest.names, "other", "others"), seconds: rest.seconds, parts: [{ seconds: rest.seconds, colour: "var(--c8)" }] });
    return barFigure({
      id: "by-device", title: "Time by device", about: "How long each device played.", bars, rows: played,
      columns: [["Device", (row) => named(row.name)], ["Played", (row) => duration(row.seconds), true], ["Average volume", (row) => percent(row.averageVolume), true], ["Sessions", (row) => count(row.sessions), true]],
      emptyText: "No playback was recorded in this time.",
    });
  }

  // Bars side by side. columnsOf: rows with from, until (numbers or dates), or a name for each.
  function columnFigure({ id, title, about, rows, value, x, columns, emptyText, ordinal, colour = "var(--c1)", label, yLabel, shares, counts }) {
    if (rows.length === 0) return figure({ id, title, about: null, emptyText });
    const greatest = Math.max(...rows.map(value), shares ? 0.01 : 1);
    const ticks = counts ? Math.min(4, greatest) : 4;
    return figure({
      id, title, about, columns, rows,
      draw: (width) => plot({
        width: ordinal ? Math.min(width, 70 + rows.length * 110) : width, height: 210, marginLeft: 52, marginRight: 10, marginTop: 22, marginBottom: 38,
        x: { label, labelArrow: "none", ...x(width) },
        y: { domain: [0, greatest], ticks, label: yLabel, labelArrow: "none", ...(shares ? { tickFormat: percent } : {}) },
        marks: [
          charts.gridY({ ticks, stroke: "var(--line)", strokeOpacity: 1 }),
          ordinal
            ? charts.barY(rows, tagged(rows, { x: ordinal, y: value, fill: colour, title: (d) => columns.map(([heading, cell]) => `${heading}: ${cell(d)}`).join(", ") }, (d) => ({ mark: "column", value: value(d) })))
            : charts.rectY(rows, tagged(rows, { x1: "from", x2: "until", y: value, fill: colour, insetLeft: 0.5, insetRight: 0.5, title: (d) => columns.map(([heading, cell]) => `${heading}: ${cell(d)}`).join(", ") }, (d) => ({ mark: "column", value: value(d) }))),
          ordinal && rows.length <= 12 ? charts.text(rows, { x: ordinal, y: value, text: (d) => (shares ? percent(value(d)) : count(value(d))), dy: -8, fill: "var(--ink)" }) : null,
          charts.ruleY([0], { stroke: "var(--quiet)" }),
        ],
      }),
    });
  }

  function byVolume() {
    const raw = rowsOf(data.playing.byVolume);
    const unit = unitFor(Math.max(0, ...raw.map(({ seconds }) => seconds)));
    const rows = raw.map((row) => ({ ...row, from: Math.max(-0.02, (row.sixteenths - 0.5) / 16), until: Math.min(1.03, (row.sixteenths + 0.5) / 16) }));
    return columnFigure({
      id: "by-volume", title: "Time by volume", about: "How long was played at each volume, in steps of a sixteenth.", rows, value: (row) => row.seconds / unit.seconds,
      x: () => ({ domain: [-0.02, 1.04], ticks: [0, 0.25, 0.5, 0.75, 1], tickFormat: percent }), label: "volume", yLabel: unit.name,
      columns: [["Volume", (row) => percent(row.sixteenths / 16), true], ["Played", (row) => duration(row.seconds), true]], emptyText: "No volume was reported in this time.",
    });
  }

  // ---- Overloads

  function overloadsOverTime() {
    const step = data.issues.stepSeconds;
    const name = { 3600: "hour", 86400: "day", 604800: "week" }[step];
    const rows = data.issues.overTime.map(([begin, end, number]) => ({ at: begin, from: new Date(begin * 1000), until: new Date(end * 1000), count: number }));
    const domain = [new Date(Math.min(possible(data.from) * 1000, ...rows.map(({ from }) => +from))), new Date(Math.max(possible(data.until) * 1000, ...rows.map(({ until }) => +until)))];
    const unseen = totals.overloads - sum(rows, (row) => row.count);
    const newest = unseen > 0 ? ` These are the newest; ${many(unseen, "overload is", "overloads are")} older.` : "";
    return columnFigure({
      id: "overloads", title: "Overloads over time", about: `How often the audio overloaded in each ${name}.${newest}`, rows, value: (row) => row.count, colour: "var(--bad)", counts: true,
      x: (width) => ({ type: "utc", domain, ...ticksOf(domain[0] / 1000, domain[1] / 1000, Math.max(2, Math.round(width / 90))) }), label: null, yLabel: "overloads",
      columns: [[{ hour: "Hour", day: "Day", week: "Week from" }[name], (row) => (step === 3600 ? atMinute(row.at) : dayText.format(local(row.at)))], ["Overloads", (row) => count(row.count), true]], emptyText: "No overload was recorded in this time.",
    });
  }

  const MOST_BUFFERS = 40;
  function overloadsByBuffer() {
    return columnFigure({
      id: "buffers", title: "Overloads by buffer size", about: `Smaller buffers give shorter delays and less time to fill them.${overloaded.length === MOST_BUFFERS ? ` These are the ${MOST_BUFFERS} smallest.` : ""}`, rows: overloaded, value: (row) => row.count, colour: "var(--bad)", counts: true,
      ordinal: (row) => (row.frames === null ? UNKNOWN : count(row.frames)), x: () => ({ type: "band", domain: overloaded.map((row) => (row.frames === null ? UNKNOWN : count(row.frames))), padding: 0.3 }), label: "frames in the buffer", yLabel: "overloads",
      columns: [["Frames", (row) => (row.frames === null ? UNKNOWN : count(row.frames)), true], ["Overloads", (row) => count(row.count), true], ["Together", (row) => duration(row.seconds), true]],
      emptyText: "No overload was recorded in this time.",
    });
  }

  // ---- Glitches

  const MOST_LISTED = 100;
  const MOST_REASON_LETTERS = 300; // its end may say who had the processor
  function whoseGlitches() {
    const { rest, judged } = data.glitches;
    const rows = rowsOf(data.glitches.top);
    const bars = rows.map(({ culprit, count: number }) => ({ name: named(culprit), seconds: number, parts: [{ seconds: number, colour: culprit === null ? "var(--c8)" : "var(--bad)" }] }));
    if (rest.names > 0) bars.push({ name: many(rest.names, "other", "others"), seconds: rest.count, parts: [{ seconds: rest.count, colour: "var(--c8)" }] });
    return barFigure({
      id: "culprits", title: "Whose glitches", counts: "glitches", bars: judged > 0 ? bars : [], rows,
      about: "Who caused how many, as the PipeWire bridge judges. An overload that several sessions heard counts once.",
      columns: [["Who", (row) => named(row.culprit)], ["Causes", (row) => (row.causes ?? "").split(",").filter(Boolean).join(", ") || UNKNOWN], ["Glitches", (row) => count(row.count), true],
        ["Share", (row) => percent(row.count / data.glitches.count), true], ["Lost", (row) => milliseconds(row.lostMs), true], ["Worst, beyond the deadline", (row) => milliseconds(row.worstMs), true]],
      emptyText: data.glitches.count > 0 ? "Nobody judged whose these overloads were: the PipeWire bridge does, while it runs." : "No glitch was recorded in this time.",
    });
  }

  function newestGlitches() {
    const rows = rowsOf(data.glitches.newest);
    if (rows.length === 0) return null;
    return el("figure", { id: "glitches" }, el("figcaption", {}, el("h3", {}, "Glitches one by one"),
      el("p", {}, `${rows.length === MOST_LISTED ? `The newest ${MOST_LISTED}.` : "The newest first."} “twctl glitches --why” and the number shows the cycles around one, and what to do.`)),
    table([["Number", (row) => String(row.id)], ["Time", (row) => at(row.at)], ["Cause", (row) => row.cause ?? (row.judged ? UNKNOWN : "not judged")], ["Who", (row) => `${named(row.culprit)}${row.process && row.process !== row.culprit ? ` (${row.process})` : ""}`],
      ["Heard by", (row) => `${named(row.heard)}${row.sessions > 1 ? `, in ${count(row.sessions)} sessions` : ""}`], ["Beyond the deadline", (row) => milliseconds(row.over), true], ["Lost", (row) => milliseconds(row.lost), true],
      ["Times", (row) => count(row.times), true], ["Reason", (row) => row.reason ?? "", false, MOST_REASON_LETTERS]], rows));
  }
  const glitchParts = () => [whoseGlitches(), newestGlitches()].filter(Boolean);

  // ---- Drivers

  const MOST_CHANNELS = 12;
  const MOST_PARTS = 64;
  const MOST_COUNTERS = 60;
  // The rows of each channel, in their order.
  function channelsOf(rows) {
    const channels = new Map();
    for (const row of rows) {
      const key = JSON.stringify([row.driver, row.group, row.subgroup, row.name, row.unit]);
      if (!channels.has(key)) channels.set(key, []);
      channels.get(key).push(row);
    }
    return [...channels.values()];
  }
  const channelTitle = (row) => [row.group, row.subgroup, row.name].filter(Boolean).join(" · ") || UNKNOWN;

  function histogram(rows) {
    const all = sum(rows, (row) => row.hits);
    const [first] = rows;
    const bounds = (row) => (row.lower === null || row.upper === null ? UNKNOWN : `${count(row.lower)}–${count(row.upper)}`);
    return columnFigure({
      title: channelTitle(first), about: `Driver ${named(first.driver)}${first.unit ? `, in ${first.unit}` : ""}, ${many(all, "count", "counts")}.${rows.length === MOST_PARTS ? " Neighbouring buckets are added up." : ""}`, rows, value: (row) => (all ? row.hits / all : 0), shares: true,
      ordinal: bounds, x: (width) => ({ type: "band", domain: rows.map(bounds), padding: 0.15, tickRotate: rows.length > width / 55 ? -40 : 0 }), label: null, yLabel: "share", colour: "var(--c3)",
      columns: [[first.unit || "Range", bounds], ["Share", (row) => percent(all ? row.hits / all : 0), true], ["Counted", (row) => count(row.hits), true]],
    });
  }

  function states(rows) {
    const all = sum(rows, (row) => row.residency);
    const [first] = rows;
    const palette = rows.map((row, i) => ({ ...row, share: all ? row.residency / all : 0, colour: `var(--c${Math.min(8, i + 1)})` }));
    return figure({
      title: channelTitle(first), about: `Driver ${named(first.driver)}: the share of the time in each state.`, rows: palette, legendOf: palette.map((row) => [`${named(row.state)} ${percent(row.share)}`, row.colour]),
      columns: [["State", (row) => named(row.state)], ["Share", (row) => percent(row.share), true], ["Times entered", (row) => count(row.transitions), true]],
      draw: (width) => plot({
        width, height: 64, marginLeft: 14, marginRight: 18, marginTop: 4, marginBottom: 24, x: { domain: [0, 1], ticks: [0, 0.25, 0.5, 0.75, 1], tickFormat: percent, label: null }, y: { axis: null },
        marks: [charts.barX(palette, tagged(palette, { x: "share", y: () => "", fill: "colour", title: (d) => `${named(d.state)}: ${percent(d.share)}` }, (d) => ({ mark: "state", share: d.share })))],
      }),
    });
  }

  function drivers() {
    const histograms = channelsOf(rowsOf(data.drivers.buckets)).map(histogram);
    const all = channelsOf(rowsOf(data.drivers.states)).map(states);
    const values = rowsOf(data.drivers.values);
    if (histograms.length + all.length + values.length === 0) return [empty("No driver published counters in this time.")];
    return [
      session || histograms.length + all.length === 0 ? null : el("p", { class: "quiet" }, "Added up over sessions. What drivers count while two sessions are open counts for both."),
      Math.max(histograms.length, all.length) === MOST_CHANNELS ? el("p", { class: "quiet" }, `Shown are the ${MOST_CHANNELS} histograms, and as many states, that counted most.`) : null,
      el("div", { class: "pair" }, ...histograms, ...all),
      values.length ? el("figure", {}, el("figcaption", {}, el("h3", {}, "Counters"), el("p", {}, session ? "What drivers counted during the session." : "What drivers counted during sessions, added up. What they count while two sessions are open counts for both.", values.length === MOST_COUNTERS ? ` These are the first ${MOST_COUNTERS}.` : "")),
        table([["Driver", (row) => named(row.driver)], ["Counter", channelTitle], ["Sum", (row) => `${count(row.sum)} ${row.unit ?? ""}`.trim(), true]], values)) : null,
    ].filter(Boolean);
  }

  // ---- The rest

  const MOST_FORMATS = 12;
  function otherTables() {
    const parts = [];
    const haptics = rowsOf(data.haptics);
    const formats = rowsOf(data.playing.formats);
    const wrap = (title, about, made) => el("figure", {}, el("figcaption", {}, el("h3", {}, title), about ? el("p", {}, about) : null), made);
    parts.push(wrap("Haptics by application", "For how long the haptics engine was on. Applications report it without a unit; the page takes it for seconds.", haptics.length
      ? table([["Application", (row) => named(row.application)], ["Events", (row) => count(row.count), true], ["Together", (row) => duration(row.seconds), true]], haptics)
      : empty("The haptics engine was not used in this time.")));
    parts.push(wrap("Formats", `How long was played in each format${formats.length === MOST_FORMATS ? `; the ${MOST_FORMATS} that played longest` : ""}.`, formats.length
      ? table([["Device", (row) => named(row.device)], ["Format", (row) => [row.sampleRate ? `${count(row.sampleRate)} Hz` : null, row.channels ? many(row.channels, "channel", "channels") : null, row.format].filter(Boolean).join(", ") || UNKNOWN], ["Time", (row) => duration(row.seconds), true]], formats)
      : empty("No format was reported in this time.")));
    return el("div", { class: "pair" }, ...parts);
  }

  function health() {
    const made = [el("p", {}, daemonSentence())];
    const { answers, refused, sinks, tellsSinks } = data.daemon;
    if (!answers) return made;
    if (sinks.length) made.push(table([["Sink", (row) => row.sink], ["Waiting", (row) => count(row.waiting), true], ["Dropped", (row) => count(row.dropped), true], ["Hangs", (row) => (row.hangs > 0 ? `for ${duration(row.hangs)}` : "no")]], sinks));
    else made.push(el("p", { class: "quiet" }, tellsSinks ? "The daemon has no sinks." : "The daemon tells only trusted users how its sinks stand."));
    if (refused.length) made.push(el("p", {}, "What it refused:"), table([["User", (row) => String(row.user)], ["Of what there was too much", (row) => row.resource], ["Times", (row) => count(row.times), true]], refused));
    return made;
  }

  function sessionTables() {
    const facts = [
      ["Application", named(session.application)], ["Service", named(session.service)], ["Process", named(session.process)], ["User", session.user === null ? UNKNOWN : String(session.user)],
      ["Reporter identifier", session.reporter === null ? UNKNOWN : String(session.reporter)], ["Started", at(session.started) || UNKNOWN], ["Ended", session.ended === null ? noEnd() : `${at(session.ended)}, ${named(session.ending)}`],
      ["Open for", session.ended === null || session.started === null ? UNKNOWN : duration(session.ended - session.started)], ["Active for", session.activeSeconds === null ? UNKNOWN : duration(session.activeSeconds)],
      ["Messages", session.messages === null ? UNKNOWN : `${count(session.messages)}, of which ${count(session.redundantMessages)} said nothing new`],
    ];
    const stretches = rowsOf(session.played);
    const inputs = rowsOf(session.heard);
    const issues = rowsOf(session.issues);
    const kinds = rowsOf(session.kinds);
    const part = (title, rows, columns, none, most = 250) => [el("h3", {}, title), rows.length ? table(columns, rows) : empty(none),
      ...(rows.length === most ? [el("p", { class: "quiet" }, `These are the first ${most}; there may be more.`)] : [])];
    return [
      el("h2", {}, "The session"), table([["Fact", (row) => row[0]], ["Value", (row) => row[1]]], facts),
      el("h2", {}, "What it did"),
      ...part("What was played", stretches, [["From", (row) => at(row.started)], ["For", (row) => duration(row.seconds), true], ["Device", (row) => named(row.device)], ["Volume", (row) => percent(row.volume), true], ["Ringer", (row) => (row.ringer === null ? UNKNOWN : row.ringer === 1 ? "on" : "off")]], "No playback of it was recorded."),
      ...part("Inputs", inputs, [["From", (row) => at(row.started)], ["For", (row) => duration(row.seconds), true], ["Device", (row) => named(row.device)], ["Mode", (row) => named(row.mode)]], "No input of it was recorded."),
      ...part("Issues", issues, [["Time", (row) => at(row.at)], ["Kind", (row) => named(row.kind)], ["Where", (row) => row.node ?? ""], ["Lasted", (row) => duration(row.seconds), true], ["Buffer, in frames", (row) => count(row.frames), true]], "No issue of it was recorded."),
      ...part("Messages by kind", kinds, [["Category", (row) => named(row.category)], ["Type", (row) => named(row.type)], ["From", (row) => (row.source === "derived" ? "the daemon" : "the client")], ["Messages", (row) => count(row.count), true], ["First", (row) => at(row.first)], ["Last", (row) => at(row.last)]], "The store has none of its messages.", 60),
    ];
  }

  // ---- The page and its parts

  // What readers have done with these elements: tables that they opened, how far they scrolled in them, and the focus.
  const REMEMBERED = "details, .scroll, summary, button, select, [tabindex]";
  function placesOf(nodes) {
    const found = new Map();
    for (const node of nodes) {
      for (const element of [node, ...node.querySelectorAll("*")].filter((one) => one.matches(REMEMBERED))) {
        const of = element.closest("figure")?.querySelector("h3")?.textContent ?? "";
        let number = 0;
        while (found.has(`${of}/${element.tagName}/${number}`)) ++number;
        found.set(`${of}/${element.tagName}/${number}`, element);
      }
    }
    return found;
  }
  const placesIn = (nodes) => [...placesOf(nodes)].map(([name, element]) => ({ name, open: element.open, top: element.scrollTop, left: element.scrollLeft, hasFocus: element === document.activeElement }));
  function restore(nodes, places) {
    const elements = placesOf(nodes);
    for (const { name, open, top, left, hasFocus } of places) {
      const element = elements.get(name);
      if (!element) continue;
      if (open) element.open = true;
      if (top || left) element.scrollTo({ top, left, behavior: "instant" });
      if (hasFocus) element.focus({ preventScroll: true });
    }
  }

  const section = (text) => () => [el("h2", {}, text)];
  // The parts of the page, in their order. Each function makes its elements anew.
  function partsNow() {
    const beginning = [() => [heading()], ...(data.live ? [liveMark] : []), () => [el("ul", { class: "findings" }, ...findings().map((text) => el("li", {}, text)))], () => [numbers()], section("Timeline"), timelinePart];
    const middle = session
      ? [sessionTables, ...(totals.overloads > 0 ? [section("Overloads"), () => [overloadsByBuffer()]] : []), ...(data.glitches.count > 0 ? [section("Glitches"), glitchParts] : [])]
      : [() => [heatMap()], section("Where the time went"), () => [byApplication()], () => [el("div", { class: "pair" }, byDevice(), byVolume())],
        section("Overloads"), () => [el("div", { class: "pair" }, overloadsOverTime(), overloadsByBuffer())], section("Glitches"), glitchParts];
    return [...beginning, ...middle, section("Drivers"), drivers, ...(session ? [] : [section("Haptics and formats"), () => [otherTables()]]),
      ...(data.daemon ? [section("The daemon's own health"), health] : []), () => [footer()]];
  }
  const footer = () => el("footer", {}, el("p", {}, data.live
    ? `Served by twctl ${data.version ?? ""} from the device's report store and its daemon. The page asks no other server, and changes nothing. Pictures: Observable Plot and d3, whose licences are in this page.`
    : `Made by twctl ${data.version ?? ""} from the device's report store. The page needs no network and sends nothing. Pictures: Observable Plot and d3, whose licences are in this file.`));

  let timelineFigure = null;
  function timelinePart() {
    timelineFigure = timeline();
    return [timelineFigure];
  }

  // Each has its elements, and their text before pictures were drawn, by which a change is noticed.
  let parts = [];
  const textOf = (nodes) => nodes.map((node) => node.outerHTML).join("\n");
  function build() {
    pictures = [];
    parts = partsNow().map((make) => {
      const nodes = make();
      return { nodes, text: textOf(nodes) };
    });
    page.replaceChildren(...parts.flatMap(({ nodes }) => nodes));
  }
  const draw = (picture, width) => picture.redraw(Math.max(240, Math.floor(width ?? picture.box.parentElement.clientWidth)));

  // Takes newer data. Only what they change is made anew; the timeline keeps its zoom.
  function update(next) {
    data = next;
    derive();
    const scrolled = [scrollX, scrollY];
    const makers = partsNow();
    if (makers.length !== parts.length) {
      const places = placesIn([page]);
      build();
      redrawAll();
      restore([page], places);
    } else {
      makers.forEach((make, i) => {
        if (make === liveMark || (make === timelinePart && timelineFigure.update())) return;
        const before = pictures.length;
        const nodes = make();
        const text = textOf(nodes);
        if (text === parts[i].text) {
          pictures.length = before;
          return;
        }
        // The new elements are drawn before the old ones go, so that the page never becomes shorter than the place that is read.
        const places = placesIn(parts[i].nodes);
        const old = parts[i].nodes;
        old[0].before(...nodes);
        pictures.slice(before).forEach((picture) => draw(picture));
        old.forEach((node) => node.remove());
        parts[i] = { nodes, text };
        restore(nodes, places);
      });
      pictures = pictures.filter(({ box }) => box.isConnected);
    }
    scrollTo({ left: scrolled[0], top: scrolled[1], behavior: "instant" });
  }

  let drawnFor = 0;
  function redrawAll(width) {
    for (const picture of pictures) draw(picture, width);
  }

  // ---- Live

  const NO_SERVER = "twctl serve does not answer; trying again.";
  const SHUT = "twctl serve refuses this page. If it was started again, open the address that it has printed.";
  const NOT_YET = "Asking twctl serve what runs.";
  const liveSays = el("p", { class: "live-says", role: "status", "aria-live": "polite" }, NOT_YET);
  const liveTime = el("p", { class: "quiet live-time" });
  const nowList = el("ul", { class: "now", "aria-label": "What plays now" });
  const liveBox = el("section", { id: "live", "aria-label": "Live" }, liveSays, liveTime, nowList);
  const liveMark = () => [liveBox];
  let serverProblem = NOT_YET;

  // Only a change of the connection is read aloud.
  function showState() {
    const text = serverProblem || state.problem || state.storeProblem || "Live: the daemon answers.";
    if (liveSays.textContent !== text) liveSays.textContent = text;
    liveBox.classList.toggle("lost", Boolean(serverProblem || state?.problem));
    if (!state) return;
    const missed = state.missed > 0 ? ` ${many(state.missed, "message was", "messages were")} missed.` : "";
    const leftOut = state.leftOut > 0 ? ` ${many(state.leftOut, "more session runs", "more sessions run")}.` : "";
    const time = `Last change: ${at(state.changed)}.${missed}${leftOut}`;
    if (liveTime.textContent !== time) liveTime.textContent = time;
    const { sessions, stretches } = running();
    const open = stretches.filter(({ isOpen }) => isOpen && state.answers && !serverProblem);
    const texts = open.map((row) => `${nameOfSession(sessions.find(({ id }) => id === row.session))}: ${named(row.device)} at ${percent(row.volume) || "unknown volume"}, for ${duration(Math.max(1, Math.round(row.ended - row.started)))}`);
    if (texts.length === 0) texts.push(state.answers && !serverProblem ? "Nothing plays now." : "What plays now is not known.");
    while (nowList.children.length > texts.length) nowList.lastElementChild.remove();
    texts.forEach((line, i) => {
      if (!nowList.children[i]) nowList.append(el("li"));
      if (nowList.children[i].textContent !== line) nowList.children[i].textContent = line;
    });
  }

  // A picture with many marks takes its time. It gets at most a part of the processor's.
  let drawAgain = 0;
  function showTime(isNews) {
    showState();
    if (document.hidden || (!isNews && performance.now() < drawAgain)) return;
    const begin = performance.now();
    if (!timelineFigure.update()) {
      const next = timeline();
      timelineFigure.replaceWith(next);
      const part = parts.find(({ nodes }) => nodes[0] === timelineFigure);
      part.nodes = [next];
      part.text = textOf([next]);
      timelineFigure = next;
      pictures = pictures.filter(({ box }) => box.isConnected);
      pictures.filter(({ box }) => next.contains(box)).forEach((picture) => draw(picture));
    }
    drawAgain = begin + Math.max(900, 8 * (performance.now() - begin));
  }

  let asks = false;
  async function takeStored(address) {
    if (asks) return;
    asks = true;
    let text = null;
    try {
      const answer = await fetch(address, { cache: "no-store" });
      if (answer.ok) text = await answer.text();
    } catch {
      // The next state asks again.
    }
    asks = false;
    if (text !== null) update(parse(text));
    showTime(true);
  }

  function goLive() {
    const token = encodeURIComponent(new URLSearchParams(location.search).get("token") ?? "");
    const source = new EventSource(`live?token=${token}`);
    source.addEventListener("message", (event) => {
      const before = state;
      state = parse(event.data);
      state.came = performance.now();
      state.lost = state.answers ? null : before?.lost ?? state.lost;
      serverProblem = "";
      showTime(true);
      if (state.stored !== data.live.stored) takeStored(`data?token=${token}`);
    });
    source.addEventListener("error", () => {
      serverProblem = source.readyState === EventSource.CLOSED ? SHUT : NO_SERVER;
      if (state && state.answers) state = { ...state, answers: false, lost: nowAt() };
      showState();
    });
    setInterval(() => {
      showTime(false);
      if (state && state.stored !== data.live.stored) takeStored(`data?token=${token}`);
    }, 1000);
    document.addEventListener("visibilitychange", () => showTime(true));
  }

  build();
  redrawAll();
  drawnFor = document.documentElement.clientWidth;
  if (data.live) goLive();
  let resizing = 0;
  addEventListener("resize", () => {
    cancelAnimationFrame(resizing);
    resizing = requestAnimationFrame(() => {
      if (document.documentElement.clientWidth === drawnFor) return;
      drawnFor = document.documentElement.clientWidth;
      redrawAll();
    });
  });
  // A picture for paper has the paper's width, so that its letters have the size of the text.
  const PAPER = 690;
  addEventListener("beforeprint", () => {
    isPrinting = true;
    for (const picture of pictures) picture.redraw(picture.box.closest(".pair") ? Math.floor((PAPER - 32) / 2) : PAPER);
  });
  addEventListener("afterprint", () => {
    isPrinting = false;
    redrawAll();
  });
  document.documentElement.dataset.ready = "yes";
})();
