"use strict";
(() => {
  const data = JSON.parse(document.getElementById("data").textContent);
  const at = (id) => document.getElementById(id);
  const hidden = /[\u0000-\u001f\u007f-\u009f\u200e\u200f\u202a-\u202e\u2066-\u2069]/g;
  /** Text from anywhere, in one direction of its own, without characters that are not seen. */
  const clean = (text) => String(text).replace(hidden, "\ufffd");
  const make = (tag, className, text) => {
    const element = document.createElement(tag);
    if (className) element.className = className;
    if (text !== undefined) element.textContent = text;
    return element;
  };
  const named = (tag, className, text) => {
    const element = make(tag, className);
    element.append(make("bdi", "", clean(text)));
    return element;
  };
  const counted = (count, one) => `${count.toLocaleString("en")} ${one}${count === 1 ? "" : "s"}`;
  /** With so many decimals of a second, where there are minutes. */
  const minutes = (micros, decimals) => {
    const whole = Math.floor(micros / 6e7);
    return `${whole} min ${((micros - whole * 6e7) / 1e6).toFixed(decimals)} s`;
  };
  /** Apart from others that are a step away. */
  const seconds = (micros, step = micros / 100) => {
    const decimals = (unit) => Math.max(0, Math.min(6, Math.ceil(-Math.log10(Math.max(step, 1) / unit) - 1e-9)));
    if (micros < 1000) return `${Math.round(micros)} µs`;
    if (micros < 1e6) return `${(micros / 1e3).toFixed(decimals(1e3))} ms`;
    if (micros < 6e7) return `${(micros / 1e6).toFixed(decimals(1e6))} s`;
    return minutes(micros, decimals(1e6));
  };
  const moment = (micros) => (micros < 6e7 ? `${(micros / 1e6).toFixed(3)} s` : minutes(micros, 3));
  const tones = {};
  for (const [word, tone] of data.outcomes) tones[word] = tone;
  const toneOf = (outcome) => `tone-${tones[outcome] || "still"}`;
  const colourOf = (id) => {
    let hash = 2166136261;
    for (const character of id) hash = Math.imul(hash ^ character.codePointAt(0), 16777619) >>> 0;
    return `hsl(${hash % 360} 42% 42%)`;
  };
  const shortName = (app) => app.name.trim() || app.id.slice(app.id.lastIndexOf(".") + 1) || app.id;

  const apps = data.apps;
  const appNumbers = new Map(apps.map((app, number) => [app.id, number]));

  /** Rows of which those in sight alone are there; one of them is active, and goes with the arrow keys. */
  class RowList {
    constructor(list, height, fill, chosen) {
      Object.assign(this, { list, height, fill, chosen, count: 0, active: -1, selected: -1, rows: new Map() });
      this.most = list.clientHeight;
      this.room = list.appendChild(make("div", "room"));
      this.room.setAttribute("role", "presentation");
      list.addEventListener("scroll", () => this.draw(), { passive: true });
      list.addEventListener("keydown", (event) => this.key(event));
      list.addEventListener("click", (event) => {
        const row = event.target.closest(".row");
        if (row) this.select(Number(row.dataset.number));
      });
      new ResizeObserver(() => this.draw()).observe(list);
    }
    show(count) {
      this.count = count;
      this.active = this.selected = -1;
      this.list.removeAttribute("aria-activedescendant");
      this.room.style.height = `${Math.max(count * this.height, 1)}px`;
      this.room.replaceChildren();
      this.rows.clear();
      this.list.style.height = `${Math.min(this.most, Math.max(1, count) * this.height + 2)}px`;
      if (count === 0) this.room.append(make("p", "empty", "Nothing matches."));
      this.list.scrollTop = 0;
      this.draw();
    }
    draw() {
      const first = Math.max(0, Math.floor(this.list.scrollTop / this.height) - 4);
      const last = Math.min(this.count, Math.ceil((this.list.scrollTop + this.list.clientHeight) / this.height) + 4);
      for (const [number, row] of this.rows) {
        if (number < first || number >= last) {
          row.remove();
          this.rows.delete(number);
        }
      }
      for (let number = first; number < last; ++number) {
        let row = this.rows.get(number);
        if (!row) {
          row = make("div", "row");
          row.id = `${this.list.id}-${number}`;
          row.dataset.number = number;
          row.style.top = `${number * this.height}px`;
          row.style.height = `${this.height}px`;
          row.setAttribute("role", "option");
          row.setAttribute("aria-posinset", number + 1);
          row.setAttribute("aria-setsize", this.count);
          this.fill(row, number);
          this.rows.set(number, row);
          this.room.append(row);
        }
        row.classList.toggle("active", number === this.active);
        row.setAttribute("aria-selected", number === this.selected);
      }
    }
    select(number, scrolls) {
      if (number < 0 || number >= this.count) return;
      this.active = this.selected = number;
      const top = number * this.height;
      const room = this.list.clientHeight;
      if (scrolls) this.list.scrollTop = top - room / 2;
      else if (top < this.list.scrollTop) this.list.scrollTop = top;
      else if (top + this.height > this.list.scrollTop + room) this.list.scrollTop = top + this.height - room;
      this.draw();
      this.list.setAttribute("aria-activedescendant", `${this.list.id}-${number}`);
      this.chosen(number);
    }
    key(event) {
      const page = Math.max(1, Math.floor(this.list.clientHeight / this.height) - 1);
      const steps = { ArrowDown: 1, ArrowUp: -1, PageDown: page, PageUp: -page, Home: -this.count, End: this.count };
      if (!(event.key in steps) || this.count === 0) return;
      event.preventDefault();
      this.select(Math.min(this.count - 1, Math.max(0, this.active + steps[event.key])));
    }
  }

  const addFacts = (list, facts) => {
    for (const [name, value] of facts) {
      if (value === "" || value === undefined) continue;
      list.append(make("dt", "", name), named("dd", "", value));
    }
    if (!list.children.length) list.append(make("dd", "", "none"));
  };
  const fillSelect = (select, choices) => {
    for (const [value, text] of choices) {
      const option = make("option", "", text);
      option.value = value;
      select.append(option);
    }
  };
  const soon = (act) => {
    let waiting = 0;
    return () => {
      cancelAnimationFrame(waiting);
      waiting = requestAnimationFrame(act);
    };
  };

  // What every part may be asked for by another.
  const shown = {};

  const drawTop = () => {
    const run = data.run;
    document.title = clean(`${data.device}: ${data.title}`);
    at("title").replaceChildren(named("span", "", data.device), ` · ${data.title}`);
    at("subtitle").textContent = clean([run.command && `tsd ${run.command}`, run.began, run.result].filter(Boolean).join(" · "));
    at("made").textContent = clean(`Made ${data.made} by ${data.maker}.`);
    addFacts(at("versions"), data.versions);
    if (data.home) addFacts(at("settings"), data.settings);
    const button = at("theme");
    const wish = matchMedia("(prefers-color-scheme: dark)");
    const dress = (dark) => {
      document.documentElement.dataset.theme = dark ? "dark" : "light";
      button.setAttribute("aria-pressed", dark);
      if (shown.redraw) shown.redraw();
    };
    dress(wish.matches);
    wish.addEventListener("change", () => dress(wish.matches));
    button.addEventListener("click", () => dress(document.documentElement.dataset.theme !== "dark"));
    const links = [...document.querySelectorAll("nav a")];
    const sections = new IntersectionObserver(
      (entries) => {
        for (const entry of entries) {
          const link = links.find((each) => each.hash === `#${entry.target.id}`);
          if (entry.isIntersecting) {
            for (const each of links) each.removeAttribute("aria-current");
            link.setAttribute("aria-current", "true");
          }
        }
      },
      { rootMargin: "-30% 0px -60%" }
    );
    for (const link of links) sections.observe(document.querySelector(link.hash));
  };

  const drawSummary = () => {
    const counts = new Map(data.outcomes.map(([word]) => [word, 0]));
    for (const app of apps) counts.set(app.outcome, (counts.get(app.outcome) || 0) + 1);
    at("sentence").textContent = clean(data.sentence);
    for (const [word, count] of counts) {
      if (!count) continue;
      const tile = make("button", `tile ${toneOf(word)}`);
      tile.type = "button";
      tile.append(make("b", "", count.toLocaleString("en")), word);
      tile.addEventListener("click", () => {
        at("app-outcome").value = word;
        at("app-search").value = "";
        shown.filterApps();
        at("apps").scrollIntoView();
        at("app-list").focus({ preventScroll: true });
      });
      at("tiles").append(tile);
    }
    addFacts(at("facts"), data.facts);
    fillSelect(at("app-outcome"), [["", "all"], ...[...counts].filter(([, count]) => count).map(([word]) => [word, word])]);
  };

  const iconOf = (icon) => {
    const item = make("li", "icon");
    const button = item.appendChild(make("button"));
    button.type = "button";
    if (icon.image) {
      const image = button.appendChild(make("img"));
      image.alt = "";
      image.src = `data:image/png;base64,${icon.image}`;
      if (icon.look === "demoted") image.classList.add("grey");
      else if (icon.look !== "installed" && icon.look !== "updating") image.classList.add("veiled");
    } else {
      button.style.background = colourOf(icon.id);
      button.append(make("bdi", "", clean([...shortName(icon)][0]).toUpperCase()));
    }
    if (icon.look === "demoted") button.classList.add("dashed");
    if (icon.failed) button.append(make("span", "flaw", "!"));
    const what = icon.failed ? `${icon.look}, its last install failed` : icon.look;
    button.setAttribute("aria-label", clean(`${shortName(icon)}: ${what}`));
    button.title = clean(`${icon.id}: ${what}`);
    button.addEventListener("click", () => shown.app(icon.id));
    item.append(named("span", "label", shortName(icon)));
    if (icon.look === "waiting" || icon.look === "updating") {
      const bar = item.appendChild(make("progress"));
      bar.max = 1;
      bar.value = icon.progress;
      bar.setAttribute("aria-label", clean(`${shortName(icon)}: ${Math.floor(icon.progress * 100)} %`));
    } else if (icon.look !== "installed") {
      item.append(make("span", "look", icon.look));
    }
    return item;
  };

  const drawHome = () => {
    const pages = data.home.pages;
    const atOnce = 6;
    at("home-note").textContent = clean(data.home.note);
    const add = (from, to) => {
      for (let number = from; number < Math.min(to, pages.length); ++number) {
        const page = make("div", "page");
        const list = make("ul", "icons");
        for (const icon of pages[number]) list.append(iconOf(icon));
        page.append(list, make("h3", "", `Page ${number + 1} of ${pages.length}`));
        at("pages").append(page);
      }
    };
    add(0, atOnce);
    if (!pages.length) at("pages").append(make("p", "card faint", "No apps on the home screen."));
    const more = at("more-pages");
    more.hidden = pages.length <= atOnce;
    more.textContent = `Show all ${pages.length} pages`;
    more.addEventListener("click", () => {
      add(atOnce, pages.length);
      more.hidden = true;
    });
    if (!data.home.failed.length) return;
    const list = make("ul");
    for (const gone of data.home.failed) list.append(named("li", "", `${gone.id}: ${gone.reason}`));
    at("home-failed").append(make("h3", "", "Gone after a failed install"), list);
  };

  const drawApps = () => {
    let matches = [];
    const texts = apps.map((app) => `${app.id} ${app.name} ${app.rule} ${app.outcome}`.toLowerCase());
    const tell = (number) => {
      const app = apps[matches[number]];
      at("story-heading").replaceChildren(make("bdi", "", clean(shortName(app))), " ");
      const badge = make("span", `badge ${toneOf(app.outcome)}`, app.outcome);
      at("story-heading").append(badge);
      at("story-id").replaceChildren(make("bdi", "", clean(app.id)));
      at("story-rule").replaceChildren(make("bdi", "", clean(app.rule)));
      at("story-links").hidden = false;
      shown.chosenApp = app.id;
      at("story-events").replaceChildren(
        ...app.events.map(([time, kind, text]) => {
          const item = make("li");
          const wrong = /ailed|refused|cancelled/.test(kind);
          item.append(make("time", "", moment(time)), named("span", wrong ? "wrong" : "", text));
          return item;
        })
      );
      if (shown.redraw) shown.redraw();
    };
    const list = new RowList(
      at("app-list"), 66,
      (row, number) => {
        const app = apps[matches[number]];
        row.append(named("span", "name", shortName(app)), make("span", `badge ${toneOf(app.outcome)}`, app.outcome));
        row.append(named("span", "rule", app.rule ? `${app.id} — ${app.rule}` : app.id));
      },
      tell
    );
    shown.filterApps = () => {
      const wanted = at("app-search").value.trim().toLowerCase();
      const outcome = at("app-outcome").value;
      matches = [];
      apps.forEach((app, number) => {
        if ((!outcome || app.outcome === outcome) && texts[number].includes(wanted)) matches.push(number);
      });
      at("app-count").textContent = `${matches.length.toLocaleString("en")} of ${counted(apps.length, "app")}`;
      list.show(matches.length);
    };
    shown.app = (id) => {
      if (!appNumbers.has(id)) return;
      if (!matches.includes(appNumbers.get(id))) {
        at("app-search").value = at("app-outcome").value = "";
        shown.filterApps();
      }
      at("apps").scrollIntoView();
      at("app-list").focus({ preventScroll: true });
      list.select(matches.indexOf(appNumbers.get(id)), true);
    };
    at("app-search").addEventListener("input", soon(shown.filterApps));
    at("app-outcome").addEventListener("change", shown.filterApps);
    at("story-journal").addEventListener("click", () => shown.calls(shown.chosenApp));
    at("story-timeline").addEventListener("click", () => shown.chart(shown.chosenApp));
    shown.filterApps();
  };

  const drawTimeline = () => {
    const parts = [
      ["prepare", "being prepared", ["preparing", "restoring"], ["prepared", "preparationFailed", "restored", "restoreFailed"]],
      ["placeholder", "placeholder on its way", ["attached"], ["shown"]],
      ["transfer", "its package on the way", ["transferring"], ["arrived", "transferFailed", "cancelled"]],
      ["install", "being installed", ["installing"], ["installed", "failed", "cancelled"]],
    ];
    const ends = { installed: ["✓", "good", "installed"], failed: ["✗", "bad", "failed"], cancelled: ["–", "wait", "cancelled"] };
    const tracks = [];
    let end = data.run.micros || 1;
    for (const app of apps) {
      const slices = [];
      const marks = [];
      for (const [time, kind] of app.events) {
        end = Math.max(end, time);
        for (const [part, , begins, finishes] of parts) {
          const open = slices.find((slice) => slice.part === part && slice.end < 0);
          if (!open && begins.includes(kind)) slices.push({ part, begin: time, end: -1 });
          else if (open && finishes.includes(kind)) open.end = time;
        }
        const mark = /ailed$|^failed/.test(kind) ? "failed" : kind;
        if (ends[mark]) marks.push([time, mark]);
      }
      if (slices.length || marks.length) tracks.push({ app, slices, marks, begin: app.events[0][0] });
    }
    for (const track of tracks) for (const slice of track.slices) if (slice.end < 0) slice.end = end;
    tracks.sort((one, other) => one.begin - other.begin);

    for (const [part, text] of parts) {
      const item = make("li");
      const sample = make("i");
      sample.style.background = `var(--bar-${part})`;
      item.append(sample, text);
      at("legend").append(item);
    }
    for (const [sign, tone, text] of Object.values(ends)) {
      const item = make("li");
      const sample = make("i", "mark", sign);
      sample.style.color = `var(--${tone})`;
      item.append(sample, text);
      at("legend").append(item);
    }

    if (data.journalIsCut) {
      at("cut").textContent =
        `The journal of this run has come to its size limit at ${moment(data.run.micros)}: what came later is not drawn, ` +
        "and a bar that reaches its end may have ended anywhere behind it.";
    }

    const chart = at("chart");
    const canvas = at("canvas");
    const pen = canvas.getContext("2d");
    const rowHeight = 24;
    const axis = 28;
    let from = 0;
    let span = end * 1.02;
    chart.style.height = `${Math.min(460, axis + Math.max(2, tracks.length) * rowHeight + 12)}px`;
    canvas.setAttribute("aria-label", `A row for each of ${counted(tracks.length, "app")} with what took how long`);
    const left = () => (chart.clientWidth < 600 ? 96 : 190);
    const width = () => Math.max(40, chart.clientWidth - left());
    const least = 200; // microseconds across
    const move = (newFrom, newSpan) => {
      span = Math.min(end * 1.02, Math.max(least, newSpan));
      from = Math.max(0, Math.min(end * 1.02 - span, newFrom));
      redraw();
    };
    const zoom = (factor, share = 0.5) => {
      const newSpan = Math.min(end * 1.02, Math.max(least, span * factor));
      move(from + (span - newSpan) * share, newSpan);
    };
    const ticks = () => {
      const wanted = span / Math.max(2, width() / 110);
      const power = 10 ** Math.floor(Math.log10(wanted));
      return [1, 2, 5, 10].map((each) => each * power).find((each) => each >= wanted);
    };
    const cut = (text, room) => {
      if (pen.measureText(text).width <= room) return text;
      let low = 0;
      let high = text.length;
      while (low < high) {
        const middle = (low + high + 1) >> 1;
        if (pen.measureText(text.slice(0, middle) + "…").width <= room) low = middle;
        else high = middle - 1;
      }
      return `${text.slice(0, low)}…`;
    };
    const draw = () => {
      const style = getComputedStyle(document.documentElement);
      const colour = (name) => style.getPropertyValue(`--${name}`).trim();
      const ratio = window.devicePixelRatio || 1;
      const [w, h] = [chart.clientWidth, chart.clientHeight];
      if (canvas.width !== Math.round(w * ratio) || canvas.height !== Math.round(h * ratio)) {
        canvas.width = Math.round(w * ratio);
        canvas.height = Math.round(h * ratio);
        canvas.style.width = `${w}px`;
        canvas.style.height = `${h}px`;
        at("chart-room").style.marginTop = `${-h}px`;
      }
      at("chart-room").style.height = `${Math.max(h, axis + tracks.length * rowHeight + 8)}px`;
      pen.setTransform(ratio, 0, 0, ratio, 0, 0);
      pen.fillStyle = colour("paper");
      pen.fillRect(0, 0, w, h);
      pen.font = "13px system-ui, sans-serif";
      pen.textBaseline = "middle";
      pen.direction = "ltr";
      const x0 = left();
      const x = (time) => x0 + ((time - from) / span) * (w - x0);
      const step = ticks();
      const first = Math.max(0, Math.floor((chart.scrollTop) / rowHeight));
      const colours = {};
      for (const [part] of parts) colours[part] = colour(`bar-${part}`);
      const [line, faint, ink, picked] = [colour("line"), colour("faint"), colour("ink"), colour("accent-ground")];
      pen.fillStyle = line;
      for (let tick = Math.ceil(from / step) * step; tick <= from + span; tick += step) pen.fillRect(x(tick), axis - 6, 1, h);
      for (let number = first; number < tracks.length; ++number) {
        const y = axis + number * rowHeight - chart.scrollTop;
        if (y > h) break;
        const track = tracks[number];
        if (track.app.id === shown.chosenApp) {
          pen.fillStyle = picked;
          pen.fillRect(0, y, w, rowHeight);
        }
        pen.save();
        pen.beginPath();
        pen.rect(x0, axis, w - x0, h - axis);
        pen.clip();
        for (const slice of track.slices) {
          const [begin, stop] = [x(slice.begin), x(slice.end)];
          if (stop < x0 || begin > w) continue;
          pen.fillStyle = colours[slice.part];
          pen.fillRect(begin, y + 5, Math.max(1.5, stop - begin), rowHeight - 10);
        }
        for (const [time, mark] of track.marks) {
          const [sign, tone] = ends[mark];
          pen.fillStyle = colour(tone);
          pen.font = "bold 13px system-ui, sans-serif";
          if (x(time) >= x0 - 8 && x(time) <= w) pen.fillText(sign, x(time) + 3, y + rowHeight / 2);
        }
        pen.restore();
        if (y + rowHeight / 2 < axis) continue;
        pen.font = "13px system-ui, sans-serif";
        pen.fillStyle = ink;
        pen.fillText(cut(clean(shortName(track.app)), x0 - 18), 10, y + rowHeight / 2 + 1);
      }
      pen.fillStyle = colour("paper");
      pen.fillRect(0, 0, w, axis - 6);
      pen.fillStyle = faint;
      pen.font = "12px system-ui, sans-serif";
      for (let tick = Math.ceil(from / step) * step; tick <= from + span; tick += step) {
        const text = tick === 0 ? "0" : seconds(Math.round(tick * 10) / 10, step);
        if (x(tick) + pen.measureText(text).width < w) pen.fillText(text, x(tick) + 2, 11);
      }
      pen.fillStyle = line;
      pen.fillRect(0, axis - 6, w, 1);
      if (!tracks.length) {
        pen.fillStyle = faint;
        pen.fillText("No app took any time.", 10, axis + 20);
      }
      at("span").textContent = `${from === 0 ? 0 : seconds(from, span / 100)} to ${seconds(from + span, span / 100)}, ${counted(tracks.length, "app")}`;
    };
    const redraw = soon(draw);
    shown.redraw = redraw;
    shown.chart = (id) => {
      const number = tracks.findIndex((track) => track.app.id === id);
      if (number < 0) return;
      chart.scrollTop = number * rowHeight - chart.clientHeight / 2;
      const { slices, begin } = tracks[number];
      const last = Math.max(begin + least, ...slices.map((slice) => slice.end));
      move(begin - (last - begin) * 0.15, (last - begin) * 1.4);
      at("timeline").scrollIntoView();
    };
    at("zoom-in").addEventListener("click", () => zoom(0.5));
    at("zoom-out").addEventListener("click", () => zoom(2));
    at("zoom-fit").addEventListener("click", () => move(0, end * 1.02));
    chart.addEventListener("keydown", (event) => {
      const acts = {
        "+": () => zoom(0.5), "=": () => zoom(0.5), "-": () => zoom(2), 0: () => move(0, end * 1.02),
        ArrowLeft: () => move(from - span / 8, span), ArrowRight: () => move(from + span / 8, span),
      };
      if (!acts[event.key] || event.ctrlKey || event.metaKey) return;
      event.preventDefault();
      acts[event.key]();
    });
    const shareOf = (clientX) => (clientX - chart.getBoundingClientRect().left - left()) / width();
    chart.addEventListener("wheel", (event) => {
      if (event.ctrlKey || event.metaKey) {
        event.preventDefault();
        zoom(Math.exp(event.deltaY / 300), Math.min(1, Math.max(0, shareOf(event.clientX))));
      } else if (event.deltaX || event.shiftKey) {
        event.preventDefault();
        move(from + ((event.deltaX || event.deltaY) / width()) * span, span);
      }
    }, { passive: false });
    const fingers = new Map();
    let moved = 0;
    chart.addEventListener("pointerdown", (event) => {
      if (event.offsetX > chart.clientWidth) return;
      fingers.set(event.pointerId, event.clientX);
      moved = 0;
    });
    chart.addEventListener("pointermove", (event) => {
      if (!fingers.has(event.pointerId)) return;
      const before = [...fingers.values()];
      const delta = event.clientX - fingers.get(event.pointerId);
      fingers.set(event.pointerId, event.clientX);
      const after = [...fingers.values()];
      moved += Math.abs(delta);
      if (fingers.size === 1) move(from - (delta / width()) * span, span);
      else zoom(Math.max(8, Math.abs(before[0] - before[1])) / Math.max(8, Math.abs(after[0] - after[1])), shareOf((after[0] + after[1]) / 2));
    });
    for (const name of ["pointerup", "pointercancel", "pointerleave"]) {
      chart.addEventListener(name, (event) => fingers.delete(event.pointerId));
    }
    chart.addEventListener("click", (event) => {
      const number = Math.floor((event.clientY - chart.getBoundingClientRect().top + chart.scrollTop - axis) / rowHeight);
      if (moved < 4 && tracks[number]) shown.app(tracks[number].app.id);
    });
    chart.addEventListener("scroll", redraw, { passive: true });
    new ResizeObserver(redraw).observe(chart);
    draw();
  };

  const drawJournal = () => {
    const { rows, threads, services, operations, texts: pool, total, left } = data.journal;
    // A row: number, time, duration, thread, service, operation, app (each a place in its table, -1: none), kind (and 4
    // when it went wrong), text.
    const kindOf = (row) => row[7] & 3;
    const isWrong = (row) => row[7] >= 4;
    const lineOf = (row) => [row[0], row[1], threads[row[3]], `${services[row[4]]}.${operations[row[5]]}`, row[6] < 0 ? "" : pool[row[6]], row[8]];
    let texts = null; // made when somebody searches
    let matches = [];
    const narrow = matchMedia("(max-width: 720px)");
    const rowHeight = () => (narrow.matches ? 64 : 28);
    const list = new RowList(
      at("call-list"), rowHeight(),
      (row, number) => {
        const [n, time, thread, what, app, text] = lineOf(rows[matches[number]]);
        for (const each of [n, moment(time), thread, what, app, text]) row.append(named("span", "", each));
        if (isWrong(rows[matches[number]])) row.classList.add("wrong");
      },
      (number) => {
        const row = rows[matches[number]];
        const [n, time, thread, what, app, text] = lineOf(row);
        at("call").replaceChildren(
          named("strong", "", what), ` · record ${n} · ${moment(time)}${row[2] ? `, took ${seconds(row[2])}` : ""} · `,
          named("span", "", thread), app ? " · " : "", named("span", "", app), "\n", named("span", "mono", text)
        );
      }
    );
    const filter = () => {
      const words = at("call-search").value.toLowerCase().split(/\s+/).filter(Boolean);
      const kind = at("call-kind").value;
      const thread = at("call-thread").value;
      if (words.length && !texts) texts = rows.map((row) => lineOf(row).slice(2).join(" ").toLowerCase());
      matches = [];
      rows.forEach((row, number) => {
        if (kind === "wrong" ? !isWrong(row) : kind !== "" && kindOf(row) !== Number(kind)) return;
        if (thread !== "" && row[3] !== Number(thread)) return;
        if (words.every((word) => texts[number].includes(word))) matches.push(number);
      });
      at("call-count").textContent = `${matches.length.toLocaleString("en")} of ${counted(rows.length, "record")}`;
      list.show(matches.length);
    };
    shown.calls = (app) => {
      at("call-search").value = app;
      at("call-kind").value = at("call-thread").value = "";
      filter();
      at("journal").scrollIntoView();
    };
    narrow.addEventListener("change", () => {
      list.height = rowHeight();
      list.show(matches.length);
    });
    fillSelect(at("call-kind"), [["", "all"], [0, "calls to the device"], [1, "calls into the plug-in"], [2, "files"], [3, "messages"], ["wrong", "what went wrong"]]);
    fillSelect(at("call-thread"), [["", "all"], ...threads.map((name, number) => [number, clean(name)])]);
    at("call").textContent = "Choose a record to see the whole of it.";
    at("left-out").textContent = left.length
      ? clean(`Of ${counted(total, "record")} the report leaves out ${left.map(([what, count]) => counted(count, what)).join(", ")}.`)
      : "";
    at("call-search").addEventListener("input", soon(filter));
    at("call-kind").addEventListener("change", filter);
    at("call-thread").addEventListener("change", filter);
    filter();
  };

  // A recording knows neither a home screen nor a device.
  if (!data.home) {
    for (const each of [at("home"), document.querySelector("nav a[href='#home']").parentElement]) each.remove();
    at("settings").parentElement.remove();
  }
  drawTop();
  drawSummary();
  if (data.home) drawHome();
  drawApps();
  drawTimeline();
  drawJournal();
  document.documentElement.dataset.ready = "yes";
})();
