// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

namespace fptest
{

// How the page of fptest html looks, on a phone too, in light and dark.
constexpr char kHtmlStyle[] =
    R"(:root { --fg: #1f2328; --bg: #fff; --soft: #59636e; --line: #d1d9e0; --bad: #c21c13; --good: #1a7f37; }
@media (prefers-color-scheme: dark) {
  :root { --fg: #e6edf3; --bg: #0d1117; --soft: #9198a1; --line: #3d444d; --bad: #ff7b72; --good: #3fb950; }
}
* { box-sizing: border-box; }
body { margin: 0 auto; padding: .5rem .75rem 3rem; max-width: 72rem; font: 1rem/1.4 system-ui, sans-serif;
  color: var(--fg); background: var(--bg); overflow-wrap: anywhere; }
a { color: inherit; }
h1 { font-size: 1.3rem; margin: .25rem 0; }
h2 { font-size: 1.15rem; margin: 1.5rem 0 .25rem; }
h3 { font-size: 1.1rem; margin: 2.5rem 0 .25rem; padding-top: .5rem; border-top: 2px solid var(--line); }
h4, h5, h6 { font-size: 1rem; margin: 0 0 .25rem; }
small, .digest, dt, figcaption { color: var(--soft); font-size: .85rem; font-weight: normal; }
p, ul, dl, figure { margin: .25rem 0; }
ul { padding-left: 1.2rem; }
dl { display: grid; grid-template-columns: max-content minmax(0, 1fr); gap: 0 .75rem; }
dd { margin: 0; white-space: pre-wrap; }
.unknown { border-left: .25rem solid var(--bad); padding-left: .5rem; }
.o { display: inline-block; padding: 0 .4em; border-radius: .2em; color: #fff; font-weight: 600; text-decoration: none; }
.passed { background: #1a7f37; }
.failed { background: #c21c13; }
.silent { background: #9a4600; }
.stopped { background: #7d3cb5; }
.flaky { background: #7d6200; }
.expected { background: #0a62c4; }
.none { background: #59636e; }
.wide { overflow-x: auto; }
table { border-collapse: collapse; }
td, th { padding: .15rem .3rem; text-align: left; vertical-align: top; font-weight: normal; }
tbody tr { border-top: 1px solid var(--line); }
.items { width: 100%; }
.items tbody th { width: 100%; }
.items th p { margin: 0; color: var(--soft); font-size: .85rem; }
.items td, .items thead th { white-space: nowrap; }
.items .rounds { display: flex; flex-wrap: wrap; gap: 2px; max-height: 12rem; overflow-y: auto; }
.matrix td { padding: 1px; text-align: center; font-size: .85rem; white-space: nowrap; }
.matrix td .o { display: block; min-width: 1.5rem; }
.matrix .o small { color: #fff; font-size: .7rem; }
.matrix th[scope=row], .matrix th:first-child { position: sticky; left: 0; min-width: 6rem; max-width: 14rem; background: var(--bg); }
.matrix thead th { vertical-align: bottom; padding: 1px; }
.matrix thead span, .matrix tfoot span { writing-mode: vertical-rl; transform: rotate(180deg); max-height: 14rem; font-size: .85rem; }
.plots { display: grid; grid-template-columns: repeat(auto-fill, minmax(min(100%, 18rem), 1fr)); gap: .75rem; margin: 1rem 0; }
.plots figure { margin: 0; display: flex; flex-direction: column; justify-content: flex-end; }
.plots svg { display: block; width: 100%; height: auto; border: 1px solid var(--line); }
.plots circle, .plots .span { fill: var(--good); stroke: var(--good); }
.plots .out { fill: none; stroke: var(--bad); stroke-width: 2; }
.plots .limit { stroke: var(--soft); stroke-dasharray: 4 3; }
.plots text { fill: var(--soft); font-size: 10px; }
article { padding: .5rem 0; border-top: 1px solid var(--line); }
article, .round { content-visibility: auto; contain-intrinsic-size: auto 8rem; }
article:target, .round:target { outline: 2px solid var(--fg); outline-offset: .25rem; }
.round, .attempt { margin: .5rem 0 .5rem .75rem; }
.said { white-space: pre-wrap; }
strong { color: var(--bad); }
pre { margin: .25rem 0; padding: .5rem; max-height: 30rem; overflow: auto; white-space: pre-wrap; border: 1px solid var(--line); }
)";

} // namespace fptest
