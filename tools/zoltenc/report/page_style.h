#pragma once

namespace zolt {

// The style sheet of the report. Everything is drawn with the colours of :root, once for light and
// once for dark screens.
constexpr const char kPageStyle[] = R"css(
:root {
    color-scheme: light dark;
    --page: #f6f7f9; --card: #ffffff; --text: #1b2129; --soft: #5a6573; --rule: #dde2e8;
    --line: #1f5fbf; --mark: #b4430c; --level: #0b7a4b;
}
@media (prefers-color-scheme: dark) {
    :root {
        --page: #12161b; --card: #1b2128; --text: #e8ecf1; --soft: #9aa7b5; --rule: #333c47;
        --line: #7db3ff; --mark: #ff9d66; --level: #5fd39f;
    }
}
* { box-sizing: border-box; }
body {
    margin: 0 auto; padding: 32px 24px 64px; max-width: 1088px; background: var(--page);
    color: var(--text); font: 15px/1.5 system-ui, -apple-system, "Segoe UI", Roboto, sans-serif;
    font-variant-numeric: tabular-nums;
}
header p, .soft { margin: 0; color: var(--soft); }
h1 { margin: 0 0 4px; font-size: 28px; line-height: 1.2; overflow-wrap: anywhere; }
h2 { margin: 40px 0 12px; font-size: 19px; }
h3 { margin: 0; font-size: 16px; }
.tiles {
    display: grid; grid-template-columns: repeat(3, 1fr); gap: 12px;
    margin: 24px 0 0; padding: 0; list-style: none;
}
.tiles li, .plot, .picture, .settings {
    background: var(--card); border: 1px solid var(--rule); border-radius: 10px;
}
.tiles li { padding: 12px 16px; }
.tiles b { display: block; font-size: 24px; line-height: 1.25; font-weight: 650; }
.tiles b small { font-size: 14px; font-weight: 500; }
.tiles span { color: var(--soft); font-size: 13px; }
.settings {
    display: grid; grid-template-columns: repeat(auto-fit, minmax(300px, 1fr)); margin: 0;
    padding: 8px 16px; column-gap: 32px;
}
.settings div {
    display: flex; justify-content: space-between; gap: 16px; padding: 6px 0;
    border-bottom: 1px solid var(--rule); margin-bottom: -1px;
}
.settings dt { color: var(--soft); white-space: nowrap; }
.settings dd { margin: 0; text-align: right; overflow-wrap: anywhere; }
.plots, .gallery { display: grid; grid-template-columns: repeat(auto-fit, minmax(min(100%, 440px), 1fr)); gap: 12px; }
.gallery { margin-top: 12px; }
.gallery.large { grid-template-columns: 100%; }
.plot { margin: 0; padding: 12px 16px; min-width: 0; }
figcaption { display: flex; flex-wrap: wrap; gap: 0 12px; align-items: baseline; }
figcaption > span { color: var(--soft); font-size: 13px; }
.key { display: inline-flex; align-items: center; gap: 6px; font-size: 13px; color: var(--soft); }
.key i { width: 14px; height: 0; border-top: 2px solid var(--line); }
.key i.level { border-top: 2px dashed var(--level); }
.key i.marks { width: 8px; height: 8px; border: 0; border-radius: 4px; background: var(--mark); }
.axes { position: relative; margin: 14px 10px 24px 46px; height: 180px; }
.axes svg { width: 100%; height: 100%; overflow: visible; display: block; }
.axes path { fill: none; vector-effect: non-scaling-stroke; }
.axes .grid { stroke: var(--rule); stroke-width: 1; }
.axes .line { stroke: var(--line); stroke-width: 1.5; stroke-linejoin: round; }
.axes .level { stroke: var(--level); stroke-width: 1.5; stroke-dasharray: 6 4; }
.axes .marks { stroke: var(--mark); stroke-width: 6; stroke-linecap: round; }
.axes span { position: absolute; color: var(--soft); font-size: 12px; line-height: 1; }
.axes .y { right: 100%; margin-right: 8px; transform: translateY(-50%); }
.axes .x { top: 100%; margin-top: 8px; transform: translateX(-50%); }
.below { text-align: center; color: var(--soft); font-size: 12px; line-height: 1; }
.picture {
    padding: 16px; min-width: 0; display: flex; flex-wrap: wrap; gap: 8px 20px;
    align-items: center; align-content: flex-start;
}
.picture > div { width: 100%; }
.picture label { display: inline-flex; align-items: center; gap: 6px; min-height: 32px; cursor: pointer; }
.picture > input { margin: 0 -14px 0 0; width: 18px; height: 18px; accent-color: var(--line); }
.stage { position: relative; border-radius: 6px; overflow: hidden; background: #000; }
.stage img { display: block; width: 100%; height: auto; }
.stage img + img, .stage svg { position: absolute; inset: 0; width: 100%; height: 100%; }
.stage .small, .stage img.small + img { image-rendering: pixelated; }
.stage .output, .stage svg { visibility: hidden; }
.show-output:checked ~ .stage .output, .show-types:checked ~ .stage .types,
.show-motion:checked ~ .stage .motion, .show-qp:checked ~ .stage .qp { visibility: visible; }
.types path { fill: none; stroke-width: 1; opacity: .5; }
.motion path, .motion use { fill: none; stroke-linecap: round; vector-effect: non-scaling-stroke; }
.motion .under { stroke: #000; stroke-width: 3; opacity: .6; }
.motion .over { stroke: #ffe34d; stroke-width: 1.4; }
.motion .from { stroke: #ffe34d; stroke-width: 3.5; }
.qp path { fill: none; stroke-width: 1; stroke: #ff3b6b; }
.inter_16x16 { --type: #3b8bff; } .inter_parts { --type: #00d5c8; } .intra_16x16 { --type: #ffb01f; }
.intra_4x4 { --type: #ff4b3e; } .pcm { --type: #c46bff; } .skipped { --type: transparent; }
.types path { stroke: var(--type); }
.counts { display: flex; flex-wrap: wrap; gap: 4px 20px; font-size: 13px; color: var(--soft); }
.counts i {
    display: inline-block; width: 12px; height: 12px; margin-right: 6px; border-radius: 3px;
    background: var(--type); border: 1px solid var(--soft); vertical-align: -1px;
}
footer { margin-top: 32px; color: var(--soft); font-size: 13px; }
@media (max-width: 600px) {
    body { padding: 20px 14px 40px; }
    h1 { font-size: 22px; }
    .tiles { grid-template-columns: 1fr 1fr; }
    .tiles b { font-size: 20px; }
    .settings { grid-template-columns: 1fr; }
    .axes { margin-left: 40px; }
    .plot, .picture { padding: 12px; }
    .motion .under { stroke-width: 2; }
    .motion .over { stroke-width: .8; }
    .motion .from { stroke-width: 2; }
}
)css";

}  // namespace zolt
