#!/usr/bin/env python3
"""Draws a timeline of `tsd sync --trace` much as a timeline viewer shows it: a drawing for the documents.

usage: trace_picture.py TRACE PICTURE.svg
"""

import collections
import html
import json
import pathlib
import sys

LEFT, WIDTH, ROW, GAP = 170, 1000, 18, 8
COLOURS = {"prepare": "#5b8fb9", "placeholder": "#8fb98a", "transfer": "#d9a441", "install": "#b0785f"}
OTHERS = ["#7fa3b8", "#a3b87f", "#b89f7f", "#9f8fb8", "#7fb8a6"]


def read(path):
    """The tracks by name, each a list of slices (begin, end, depth, name) and one of instants, in the file's order."""
    text = pathlib.Path(path).read_text(encoding="utf-8")
    try:
        events = json.loads(text)
    except ValueError:  # of a process that was killed
        events = json.loads(text + "]")
    names = {(event["pid"], event["tid"]): event["args"]["name"] for event in events
             if event.get("name") == "thread_name"}
    tracks = {track: ([], []) for track in sorted(names, key=lambda track: (-track[0], track[1]))}
    begun = collections.defaultdict(list)
    last = max(event.get("ts", 0) for event in events)
    for event in events:
        track = (event["pid"], event["tid"])
        if event["ph"] == "B":
            begun[track].append((event["ts"], event["name"]))
        elif event["ph"] == "E":
            begin, name = begun[track].pop()
            tracks[track][0].append((begin, event["ts"], len(begun[track]), name))
        elif event["ph"] == "X":
            tracks[track][0].append((event["ts"], event["ts"] + event["dur"], len(begun[track]), event["name"]))
        elif event["ph"] == "i":
            tracks[track][1].append(event["ts"])
    for track, open_slices in begun.items():
        tracks[track][0].extend((begin, last, depth, name) for depth, (begin, name) in enumerate(open_slices))
    return [(names[track], track[0], *content) for track, content in tracks.items()], last


def draw(tracks, last):
    first = min((slices[0][0] for _, group, slices, _ in tracks if group == 2 and slices), default=0)
    begin = max(0, first - (last - first) * 0.06)
    scale = WIDTH / max(1, last - begin)
    y, parts = 34, []
    step = next(step for step in (10, 20, 50, 100, 200, 500, 1000, 2000, 5000, 10**9) if (last - begin) / 1000 / step <= 12)
    ticks = [time for time in range(0, int(last / 1000) + 1, step) if time * 1000 >= begin]
    for name, _, slices, instants in tracks:
        rows = 1 + max((depth for _, _, depth, _ in slices), default=0)
        parts.append(f'<text x="12" y="{y + 13}" class="t">{html.escape(name.rpartition(".")[2])}</text>')
        drawn = {}
        for start, end, depth, label in sorted(slices, key=lambda each: (each[2], each[0])):
            if end < begin:
                continue
            x, width = LEFT + max(0, start - begin) * scale, max(0.6, (end - max(start, begin)) * scale)
            # What would lie on the same spot is drawn once.
            if width < 1 and x - drawn.get(depth, -9) < 1.2:
                continue
            drawn[depth] = x
            short = label.rpartition(".")[2]
            colour = COLOURS.get(label) or OTHERS[sum(label.encode()) % len(OTHERS)]
            top = y + depth * ROW
            parts.append(f'<rect x="{x:.1f}" y="{top}" width="{width:.1f}" height="{ROW - 2}" fill="{colour}"/>')
            if width > 7 * len(short) + 6:
                parts.append(f'<text x="{x + 4:.1f}" y="{top + 12}" class="s">{html.escape(short)}</text>')
        spots = sorted({round((time - begin) * scale) for time in instants if time >= begin})
        bottom = y + rows * ROW
        marks = "".join(f"M{LEFT + spot} {bottom - 1}l-2.5 5h5z" for spot in spots)
        parts.append(f'<path d="{marks}" fill="#a33b3b"/>')
        y = bottom + GAP
        parts.append(f'<path d="M0 {y - 1}H{LEFT + WIDTH + 20}" stroke="#e3e6ea"/>')
        y += 4
    grid = "".join(f'<path d="M{LEFT + (time * 1000 - begin) * scale:.1f} 22V{y}" stroke="#eef0f3"/>'
                   f'<text x="{LEFT + (time * 1000 - begin) * scale + 3:.1f}" y="18" class="a">{time} ms</text>'
                   for time in ticks)
    x = LEFT
    for label, colour in [*COLOURS.items(), ("a call, each kind in a colour of its own", OTHERS[0])]:
        parts.append(f'<rect x="{x}" y="{y + 6}" width="18" height="10" fill="{colour}"/>'
                     f'<text x="{x + 24}" y="{y + 15}" class="t">{label}</text>')
        x += 44 + 7 * len(label)
    parts.append(f'<path d="M{x} {y + 8}l-2.5 5h5z" fill="#a33b3b"/><text x="{x + 8}" y="{y + 15}" class="t">a mark</text>')
    y += 22
    return (f'<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {LEFT + WIDTH + 20} {y + 4}" '
            'font-family="sans-serif"><style>.t{font-size:12px;fill:#222a36}.s{font-size:10.5px;fill:#fff}'
            '.a{font-size:10px;fill:#6b7587}</style><rect width="100%" height="100%" fill="#fff"/>'
            + grid + "\n".join(parts) + "</svg>\n")


if __name__ == "__main__":
    pathlib.Path(sys.argv[2]).write_text(draw(*read(sys.argv[1])), encoding="utf-8")
