"""The page about a farm's results, in the style of the page about a run that `tsd report` writes."""

import html
import pathlib
import re

from gathering import RESULTS

STYLE = (pathlib.Path(__file__).resolve().parent / "report.css",
         pathlib.Path(__file__).resolve().parents[2] / "tsd/report/page/report.css")
OWN_STYLE = """
table { border-collapse: collapse; width: 100%; font-size: 0.9375rem; }
th, td { text-align: start; vertical-align: top; padding: 6px 12px 6px 0; border-top: 1px solid var(--line);
  overflow-wrap: anywhere; }
th { border: 0; color: var(--faint); font-weight: 500; white-space: nowrap; }
td.number { width: 1%; text-align: end; font-variant-numeric: tabular-nums; white-space: nowrap; }
pre { margin: 8px 0 0; padding: 8px 12px; background: var(--ground); border-radius: 8px; white-space: pre-wrap;
  overflow-wrap: anywhere; }
.cards { display: grid; gap: 16px; grid-template-columns: minmax(0, 1fr); }
"""
PAGE = """<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width, initial-scale=1">
<meta http-equiv="Content-Security-Policy"
      content="default-src 'none'; style-src 'unsafe-inline'; script-src 'unsafe-inline'">
<title>Farm {build}</title>
<style>{style}</style>
<script>if (matchMedia("(prefers-color-scheme: dark)").matches) document.documentElement.dataset.theme = "dark";</script>
</head>
<body>
<a class="skip" href="#main">To the content</a>
<header class="top"><div class="inner"><div><h1>Farm</h1><p class="faint">build {build}</p></div></div>
<nav aria-label="Sections"><ul>{links}</ul></nav></header>
<main id="main" tabindex="-1">{sections}</main>
</body>
</html>
"""
# Characters that are not seen, or turn the text around them.
HIDDEN = re.compile("[\\x00-\\x08\\x0b-\\x1f\\x7f-\\x9f\\u200e\\u200f\\u202a-\\u202e\\u2066-\\u2069]")


def clean(text):
    return html.escape(HIDDEN.sub("\ufffd", str(text)))


def tile(count, kind):
    words, tone = RESULTS[kind]
    return f'<div class="tile tone-{tone}"><b>{count:,}</b> {words}</div>'


def facts_of(pairs):
    return '<dl class="facts">' + "".join(f"<dt>{clean(name)}</dt><dd><bdi>{clean(text)}</bdi></dd>"
                                          for name, text in pairs if text) + "</dl>"


def table_of(headings, rows):
    """The first of the columns has numbers."""
    heads = "".join(f"<th>{clean(each)}</th>" for each in headings)
    lines = "".join(f'<tr><td class="number">{clean(first)}</td>' + "".join(f"<td>{cell}</td>" for cell in rest) + "</tr>"
                    for first, *rest in rows)
    return f'<div class="card"><table><tr>{heads}</tr>{lines}</table></div>'


def command(text):
    return f'<pre class="mono">{clean(text)}</pre>'


def card(group):
    """A group of findings: what they have in common, and what the first of them did before."""
    (_, kind), *rest = group["what"]
    detail = group["detail"] or {}
    before = "\n".join(detail.get("before", []))
    shown = [*rest, ("App", detail.get("app")), ("Then wrote", detail.get("message")),
             ("As", ", ".join(group["examples"]))]
    more = f'<details><summary>What was before</summary>{command(before)}</details>' if before else ""
    more += command(detail["text"]) if detail.get("text") else ""
    return (f'<article class="card"><h3>{group["count"]:,} × <span class="badge tone-bad">{clean(kind)}</span></h3>'
            f'{facts_of((name.capitalize(), text) for name, text in shown)}{more}'
            f'<p class="faint">To the desk:</p>{command(group["fetch"])}</article>')


def summary(gathering):
    facts = gathering.plan.facts
    tiles = "".join(tile(gathering.counts[kind], kind) for kind in RESULTS if gathering.counts[kind])
    return (f'<p class="sentence">{clean(gathering.sentence())}</p><div class="tiles">{tiles}</div>' +
            facts_of([("Recordings", facts["recordings"] and f"{gathering.replays:,} replayed of {facts['recordings']}"),
                      ("Seeds", facts["seeds"] and f"{gathering.seeds:,} played of {facts['seeds']}"),
                      ("Not compared", ", ".join(facts["ignored"])),
                      ("Took", f"{gathering.seconds:,.1f} s of one processor, {gathering.kilobytes / 1024:,.0f} MiB at most")]))


def page_of(gathering):
    sections = {"Summary": summary(gathering)}
    if gathering.groups:
        sections["Findings"] = '<div class="cards">' + "".join(map(card, gathering.groups)) + "</div>"
    if gathering.missing:
        rows = [(f"{count:,}", f"job {job}", f'<span class="mono">{clean(gathering.plan.folder / "logs" / str(job))}</span>')
                for job, count in gathering.missing.items()]
        sections["Missing"] = table_of(["Pieces", "Of", "Its log"], rows)
    rows = [(f"{each['seconds']:.3f}", clean(each["name"]) + command(each["fetch"])) for each in gathering.slowest]
    sections["Slowest"] = table_of(["Seconds", "Piece"], rows)
    rows = [(f"{pieces:,}", f"{seconds:,.1f}", clean(host)) for host, (pieces, seconds) in sorted(gathering.hosts.items())]
    sections["Machines"] = table_of(["Pieces", "Seconds", "Machine"], rows)
    style = next(path for path in STYLE if path.exists()).read_text() + OWN_STYLE
    links = "".join(f'<li><a href="#{name.lower()}">{name}</a></li>' for name in sections)
    content = "".join(f'<section id="{name.lower()}"><h2>{name}</h2>{text}</section>' for name, text in sections.items())
    return PAGE.format(build=clean(gathering.plan.facts["build"][:16]), style=style, links=links, sections=content)
