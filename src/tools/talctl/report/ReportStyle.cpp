#include "tools/talctl/report/ReportStyle.h"

namespace tal::talctl {

// Every text has a contrast of at least 4.5 with what it stands on, in light and in dark. Names come from
// clients and may be one long word: wherever they stand they break or give way, so that the page never
// scrolls sideways.
const std::string_view kReportStyle = R"(
:root {
  color-scheme: light dark;
  --page: #f3f5f8; --card: #ffffff; --edge: #dde3ea; --text: #17212c; --soft: #566372;
  --play: #2868d8; --rec: #c46a12; --bad: #c0262d; --good: #1c7c45; --track: #e8edf3;
}
@media (prefers-color-scheme: dark) {
  :root {
    --page: #0e1319; --card: #171e27; --edge: #2a3441; --text: #e8edf3; --soft: #a0adbb;
    --play: #6aa5ff; --rec: #f2ab5e; --bad: #ff8079; --good: #5fcf8d; --track: #252f3b;
  }
}
* { box-sizing: border-box; }
body {
  margin: 0 auto; padding: 1.5rem 1rem 2rem; max-width: 72rem; background: var(--page); color: var(--text);
  font: 1rem/1.45 system-ui, -apple-system, "Segoe UI", Roboto, "Noto Sans", "DejaVu Sans", sans-serif;
  font-variant-numeric: tabular-nums; -webkit-text-size-adjust: 100%; overflow-wrap: anywhere;
}
h1 { margin: 0; font-size: 1.75rem; letter-spacing: -0.01em; }
h2 { margin: 0 0 0.9rem; font-size: 1.1rem; }
header p, footer, .soft, .detail, figcaption { color: var(--soft); }
header p { margin: 0.15rem 0 1.25rem; }
footer { margin-top: 1.5rem; font-size: 0.875rem; }
section { background: var(--card); border: 1px solid var(--edge); border-radius: 0.75rem; padding: 1.1rem; }
section + section { margin-top: 1rem; }
section p { margin: 0.25rem 0; }
.bad { color: var(--bad); }
.good { color: var(--good); }

.tiles { display: grid; grid-template-columns: repeat(auto-fit, minmax(9.5rem, 1fr)); gap: 0.75rem; margin: 0 0 1rem; }
.tiles > div { background: var(--card); border: 1px solid var(--edge); border-radius: 0.75rem; padding: 0.75rem 0.85rem; }
.tiles dt { color: var(--soft); font-size: 0.875rem; }
.tiles dd { margin: 0; font-size: 1.2rem; font-weight: 650; white-space: nowrap; }

@media (min-width: 60rem) {
  main { display: grid; grid-template-columns: minmax(0, 1fr) minmax(0, 1fr); gap: 1rem; align-items: start; }
}
@media (max-width: 59.99rem) { .stack + .stack { margin-top: 1rem; } }

.ranks { list-style: none; margin: 0; padding: 0; }
.ranks li + li { margin-top: 0.85rem; }
.head { display: flex; justify-content: space-between; align-items: baseline; gap: 1rem; }
.name { font-weight: 600; min-width: 0; }
.others .name { font-weight: 400; color: var(--soft); }
.value { white-space: nowrap; flex: none; }
.bar { display: flex; height: 0.5rem; margin: 0.25rem 0; border-radius: 0.25rem; background: var(--track);
  overflow: hidden; }
.detail { font-size: 0.875rem; }
.detail span { display: inline-block; max-width: 100%; }
.play { background: var(--play); }
.rec { background: var(--rec); }

figure { margin: 0; }
.plot { position: relative; height: 9rem; margin: 0.6rem 3.6rem 0 0; border-bottom: 1px solid var(--soft); }
.line { position: absolute; left: 0; right: 0; border-top: 1px dashed var(--edge); }
.line span { position: absolute; left: calc(100% + 0.4rem); top: -0.7em; font-size: 0.8rem; color: var(--soft);
  white-space: nowrap; }
.columns { position: absolute; inset: 0; display: flex; gap: 2px; justify-content: center; }
.column { position: relative; flex: 1 1 0; min-width: 0; max-width: 5rem; display: flex; flex-direction: column;
  justify-content: flex-end; }
.column:hover { background: var(--track); }
.column i { display: block; min-height: 2px; }
.column i:first-child { border-radius: 2px 2px 0 0; }
.column.marked::after { content: ""; position: absolute; left: 50%; bottom: -0.6rem; width: 0.36rem; height: 0.36rem;
  margin-left: -0.18rem; border-radius: 50%; background: var(--bad); }
.axis { display: flex; gap: 2px; justify-content: center; margin: 0.7rem 3.6rem 0 0; height: 1.2rem; font-size: 0.8rem; color: var(--soft); }
.axis span { flex: 1 1 0; min-width: 0; max-width: 5rem; display: flex; justify-content: center; white-space: nowrap; }
.axis span b { flex: none; font-weight: 400; }
.legend { display: flex; flex-wrap: wrap; gap: 0.25rem 1rem; margin-top: 0.5rem; font-size: 0.8rem; }
.legend span::before { content: ""; display: inline-block; width: 0.7rem; height: 0.7rem; margin-right: 0.4rem;
  border-radius: 2px; background: var(--play); }
.legend .is-rec::before { background: var(--rec); }
.legend .is-bad::before { background: var(--bad); border-radius: 50%; width: 0.5rem; height: 0.5rem; }

details { margin-top: 0.75rem; }
summary { cursor: pointer; color: var(--soft); font-size: 0.875rem; }
p + .ranks { margin-top: 0.8rem; }
p + .ranks { margin-top: 0.8rem; }
table { width: 100%; border-collapse: collapse; font-size: 0.875rem; margin-top: 0.5rem; }
th { text-align: left; font-weight: 600; color: var(--soft); }
th, td { padding: 0.3rem 0.5rem 0.3rem 0; border-bottom: 1px solid var(--edge); vertical-align: top; }
th.right, td.right { text-align: right; padding-right: 0; padding-left: 0.5rem; overflow-wrap: normal; }
tr:last-child td { border-bottom: 0; }
@media print { body { background: none; } section, .tiles > div { break-inside: avoid; } }
)";

}  // namespace tal::talctl
