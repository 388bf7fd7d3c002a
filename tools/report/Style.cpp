// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Style.h"

namespace tarn::report {

const std::string_view kStyleSheet = R"(
:root {
  color-scheme: light dark;
  --ground: #ffffff; --panel: #f3f5f7; --text: #1f2328; --quiet: #59636e; --rule: #d1d9e0; --link: #0550ae;
  --running: #6e7781; --output: #0969da; --input: #8250df; --route: #59636e; --volume: #0550ae; --group: #1a7f37;
  --overload: #cf222e; --error: #bc4c00; --issue: #8a6100; --driver: #1b7c83;
}
@media screen and (prefers-color-scheme: dark) {
  :root {
    --ground: #0d1117; --panel: #1a2029; --text: #e6edf3; --quiet: #9198a1; --rule: #3d444d; --link: #79c0ff;
    --running: #8b949e; --output: #4493f8; --input: #ab7df8; --route: #9198a1; --volume: #79c0ff; --group: #3fb950;
    --overload: #ff7b72; --error: #f0883e; --issue: #d29922; --driver: #39c5cf;
  }
}
body { margin: 0 auto; max-width: 64rem; padding: 1rem; background: var(--ground); color: var(--text);
  font: 1rem/1.5 system-ui, sans-serif; }
h1 { font-size: 1.6rem; } h2 { font-size: 1.3rem; margin-top: 2.5rem; } h3 { font-size: 1.1rem; margin-top: 2rem; }
h2, h3 { border-bottom: 1px solid var(--rule); padding-bottom: .2rem; }
a { color: var(--link); }
.quiet { color: var(--quiet); }
figure { margin: 1rem 0; }
svg { display: block; width: 100%; height: auto; background: var(--panel); }
svg text { font: 12px system-ui, sans-serif; fill: var(--text); }
.end { text-anchor: end; } .middle { text-anchor: middle; }
.grid { stroke: var(--rule); }
.running { fill: var(--running); } .output { fill: var(--output); } .input { fill: var(--input); }
.group { fill: var(--group); } .overload { fill: var(--overload); } .error { fill: var(--error); }
.issue { fill: var(--issue); } .driver { fill: var(--driver); }
.route { fill: var(--panel); stroke: var(--route); }
polyline.volume { fill: none; stroke: var(--volume); stroke-width: 2; }
.wide { overflow-x: auto; }
table { border-collapse: collapse; margin: .8rem 0; font-size: .9rem; }
caption { text-align: left; font-weight: 600; padding: .2rem 0; }
th, td { border: 1px solid var(--rule); padding: .15rem .5rem; text-align: left; vertical-align: top;
  overflow-wrap: anywhere; }
thead th { background: var(--panel); overflow-wrap: normal; }
th { font-weight: 600; }
.n { text-align: right; font-variant-numeric: tabular-nums; white-space: nowrap; }
.facts .n { text-align: left; }
summary { cursor: pointer; color: var(--link); }
@media print {
  body { max-width: none; padding: 0; font-size: 10pt; }
  figure, tr, h2, h3 { break-inside: avoid; }
  h2, h3 { break-after: avoid; }
  thead { display: table-header-group; }
  details::details-content { content-visibility: visible; block-size: auto; }
  .wide { overflow: visible; }
}
)";

}  // namespace tarn::report
