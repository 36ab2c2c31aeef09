// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/reportskeleton.h"

namespace zarn::app {

const char* const kReportSkeleton = R"PAGE(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width, initial-scale=1">
<meta http-equiv="Content-Security-Policy" content="default-src 'none'; img-src data:; style-src 'unsafe-inline'; script-src 'unsafe-inline'">
<meta name="generator" content="zarn">
<link rel="icon" href="data:,">
<title>{{name}} &#8211; mosaic report</title>
<style>
:root {
  color-scheme: light dark;
  --page: #fff; --card: #f5f6f8; --text: #1b1f24; --faint: #5b6470; --rule: #d5dae1;
  --accent: #1f5fbf; --bars: #8aa9d6; --others: #c2410c;
}
@media (prefers-color-scheme: dark) {
  :root {
    --page: #14171b; --card: #1d2127; --text: #e6e9ed; --faint: #a2abb7; --rule: #363d47;
    --accent: #7fb0ff; --bars: #47658f; --others: #fb923c;
  }
}
* { box-sizing: border-box; }
body { margin: 0 auto; padding: 1.5rem clamp(1rem, 4vw, 3rem) 4rem; max-width: 84rem;
  background: var(--page); color: var(--text); font: 1rem/1.5 system-ui, sans-serif; }
h1 { margin: 0; font-size: 1.7rem; overflow-wrap: anywhere; }
h2 { margin: 2.5rem 0 .25rem; font-size: 1.25rem; }
h3 { margin: 0 0 .5rem; font-size: 1rem; overflow-wrap: anywhere; }
p { margin: .25rem 0 1rem; max-width: 46rem; }
.faint, figcaption { color: var(--faint); }
figure { margin: 0; }
:focus-visible { outline: 2px solid var(--accent); outline-offset: 2px; }

dl { display: grid; grid-template-columns: max-content 1fr; gap: .15rem 1.25rem; margin: 1rem 0 0; }
dt { color: var(--faint); }
dd { margin: 0; overflow-wrap: anywhere; }

.wide { overflow-x: auto; }
table { border-collapse: collapse; font-variant-numeric: tabular-nums; }
th, td { padding: .3rem .7rem; border-bottom: 1px solid var(--rule); text-align: right;
  vertical-align: top; }
thead th { color: var(--faint); font-weight: 600; white-space: nowrap; vertical-align: bottom; }
th.text, td.text { text-align: left; }
#scenes td.text { overflow-wrap: anywhere; min-width: 9rem; }
thead th[colspan] { text-align: center; }
tbody th { font-weight: 600; text-align: left; white-space: nowrap; }
.swatch { display: inline-block; width: .85em; height: .85em; margin-right: .45em;
  border-radius: .2em; vertical-align: -.05em; }

.stage { position: relative; width: min(100%, 85vh * {{aspect}}); aspect-ratio: {{aspect}};
  overflow: hidden; border-radius: .35rem;
  background: repeating-conic-gradient(#8883 0 25%, transparent 0 50%) 0 0 / 16px 16px; }
.stage > img, .stage > svg { display: block; width: 100%; height: 100%; }
.stage.fine { image-rendering: pixelated; }
.pictures { display: grid; gap: 0 2rem; align-items: start; margin-top: 2rem;
  grid-template-columns: repeat(auto-fit, minmax(min(100%, 26rem), 1fr)); }
.pictures > :first-child { grid-column: 1 / -1; }
.pictures.tall { grid-template-columns: repeat(auto-fit, minmax(min(100%, 19rem), 1fr)); }
.pictures.tall > :first-child { grid-column: auto; }
.pictures h2 { margin: 0 0 .5rem; }
.pictures p { margin: .5rem 0 2rem; }
#seams-section { display: grid; grid-template-columns: auto 1fr; justify-items: start; }
#seams-section > * { grid-column: 1 / -1; }
#seams-section > input { grid-area: 3 / 1; }
#seams-section > label { grid-area: 3 / 2; line-height: 1.75rem; }

/* Without script the two pictures stand side by side. */
#swipe { display: grid; grid-template-columns: 1fr 1fr; gap: 4px;
  width: min(100%, 170vh * {{aspect}}); aspect-ratio: auto; }
#split-control { display: none; }
.js #swipe { display: block; width: min(100%, 85vh * {{aspect}}); aspect-ratio: {{aspect}};
  cursor: ew-resize; touch-action: pan-y; user-select: none; --split: 50%; }
.js #swipe > * { position: absolute; inset: 0; }
.js #after-picture { clip-path: inset(0 0 0 var(--split)); }
.js #swipe::after { content: ""; position: absolute; inset: 0 auto 0 var(--split); width: 2px;
  margin-left: -1px; background: #fff; box-shadow: 0 0 0 1px #0008; }
.js #split-control { display: flex; align-items: center; gap: .75rem; margin-top: .6rem;
  width: min(100%, max(16rem, 85vh * {{aspect}})); }
#split { flex: 1; min-width: 0; height: 1.75rem; margin: 0; accent-color: var(--accent); }

#show-seams { width: 1.1rem; height: 1.1rem; margin: .9rem .5rem 0 0;
  accent-color: var(--accent); }
#show-seams + label { margin-top: .6rem; }
#show-seams:not(:checked) ~ .stage #seams { display: none; }
#seam-path { fill: none; stroke-linejoin: round; stroke-linecap: round;
  vector-effect: non-scaling-stroke; }
#seams .casing { stroke: #000; stroke-opacity: .65; stroke-width: 4px; }
#seams .line { stroke: #ffe600; stroke-width: 1.75px; }

.cards { display: grid; gap: 1rem;
  grid-template-columns: repeat(auto-fill, minmax(min(100%, 25rem), 1fr)); }
.card { padding: .9rem 1rem; border-radius: .5rem; background: var(--card); min-width: 0; }
.card table { width: 100%; }
.card th, .card td { padding: .1rem .35rem; white-space: nowrap; vertical-align: middle;
  border-bottom: 0; }
.card th:first-child { padding-left: 0; vertical-align: top; }
.card .before > * { padding-top: .45rem; border-top: 1px solid var(--rule); }
.histogram { display: block; width: 8rem; height: 2rem; }
.histogram path { fill: var(--bars); }
.histogram line { stroke: var(--accent); stroke-width: 2px; vector-effect: non-scaling-stroke; }
.histogram .others { stroke: var(--others); stroke-dasharray: 4 3; }
.key { display: inline-block; width: 1.6em; border-top: 2px solid var(--accent);
  vertical-align: .25em; }
.key.others { border-top: 2px dashed var(--others); }
.bar { display: block; height: .6rem; border-radius: .2rem; background: var(--bars); }
td.chart { width: 40%; min-width: 6rem; vertical-align: middle; }
@media (max-width: 40rem) {
  .card { padding: .75rem; }
  .card table { font-size: .8rem; }
  .card th, .card td { padding: .1rem .15rem; }
  .histogram { width: 4.5rem; }
}
@media print { .stage, .card { break-inside: avoid; } }
</style>
</head>
<body>
<script>document.documentElement.classList.add('js');</script>
<header>
<h1>{{name}}</h1>
<p class="faint">{{summary}}</p>
<dl>{{facts}}</dl>
</header>
<main>
<div class="pictures{{shape}}">
<section aria-labelledby="balance-title">
<h2 id="balance-title">Before and after</h2>
<div class="stage{{fine}}" id="swipe">
<img src="{{before}}" width="{{width}}" height="{{height}}" alt="The scenes pasted without corrections" draggable="false">
<svg id="after-picture" viewBox="0 0 {{width}} {{height}}" role="img" aria-label="The mosaic"><image id="after" href="{{after}}" width="{{width}}" height="{{height}}"/></svg>
</div>
<div id="split-control">
<label for="split">Before</label>
<input id="split" type="range" min="0" max="100" step="0.5" value="50" aria-label="Where the mosaic begins, from the left">
<label for="split">After</label>
</div>
<p class="faint">Before: the scenes pasted whole, one over the other, as they are{{freed}}. After: the
mosaic. In both the 2&nbsp;% darkest and brightest pixels of each band before are black and
white.</p>
</section>
<section aria-labelledby="sources-title">
<h2 id="sources-title">Sources</h2>
<div class="stage{{fine}}"><img src="{{map}}" width="{{width}}" height="{{height}}" alt="Map of the scenes in the colours of the list below"></div>
<p class="faint">The scene that each pixel comes from, in the colours of the list below.</p>
</section>
<section aria-labelledby="seams-title" id="seams-section">
<h2 id="seams-title">Seams</h2>
<input id="show-seams" type="checkbox" checked><label for="show-seams">Show the seams</label>
<div class="stage{{fine}}"><svg viewBox="0 0 {{width}} {{height}}" role="img" aria-label="The mosaic with its seams"><defs><path id="seam-path" d="{{seams}}"/></defs><use href="#after"/><g id="seams"><use class="casing" href="#seam-path"/><use class="line" href="#seam-path"/></g></svg></div>
<p class="faint">{{seamsNote}}</p>
</section>
</div>
<section aria-labelledby="scenes-title">
<h2 id="scenes-title">Scenes</h2>
<p>In the order of pasting.</p>
<div class="wide" role="region" aria-labelledby="scenes-title" tabindex="0">
<table id="scenes">
<thead><tr><th class="text">No.</th><th class="text">Scene</th><th class="text">File</th><th>Pixels</th><th>Share</th></tr></thead>
<tbody>{{scenes}}</tbody>
</table>
</div>
</section>
<section aria-labelledby="common-title">
<h2 id="common-title">Common pixels</h2>
{{common}}
</section>
<section aria-labelledby="residuals-title">
<h2 id="residuals-title">Along the seams</h2>
{{residuals}}
</section>
<section aria-labelledby="time-title">
<h2 id="time-title">Time</h2>
<div class="wide" role="region" aria-labelledby="time-title" tabindex="0">
<table id="times">
<thead><tr><th class="text">Step</th><th>Seconds</th><th class="text">Share of the total</th></tr></thead>
<tbody>{{times}}</tbody>
</table>
</div>
</section>
</main>
<script>
const swipe = document.getElementById('swipe');
const split = document.getElementById('split');
function showSplit() {
  swipe.style.setProperty('--split', split.value + '%');
  split.setAttribute('aria-valuetext', 'The left ' + Math.round(split.value) + ' % are before');
}
function drag(event) {
  const box = swipe.getBoundingClientRect();
  split.value = 100 * (event.clientX - box.left) / box.width;
  showSplit();
}
split.addEventListener('input', showSplit);
swipe.addEventListener('pointerdown', (event) => {
  swipe.setPointerCapture(event.pointerId);
  drag(event);
});
swipe.addEventListener('pointermove', (event) => {
  if (swipe.hasPointerCapture(event.pointerId)) drag(event);
});
showSplit();
</script>
</body>
</html>
)PAGE";

}  // namespace zarn::app
