// trace_style.h - how the page of a trace looks, by day and by night.
#pragma once

namespace cli {

inline constexpr char TRACE_STYLE[] = R"css(
:root{color-scheme:light dark;--back:#f5f6f8;--card:#fff;--ink:#1d2430;--dim:#667085;--line:#e3e6ec;--code:#fafbfc;
--tag:#175cd3;--attr:#7a5af8;--value:#0e7c5a;--text:#1d2430;--good:#067647;--good-back:#dcfae6;--bad:#b42318;--bad-back:#fee4e2;
--fault:#a15c00;--fault-back:#fdf0d0;--none:#475467;--none-back:#eaecf0}
@media(prefers-color-scheme:dark){:root{--back:#12151b;--card:#1b2029;--ink:#e6e9ef;--dim:#98a2b3;--line:#2c3340;--code:#161a22;
--tag:#84adff;--attr:#bdb4fe;--value:#6ce9a6;--text:#e6e9ef;--good:#75e0a7;--good-back:#0b3b27;--bad:#fda29b;--bad-back:#55160c;
--fault:#fec84b;--fault-back:#4e2f09;--none:#cecfd2;--none-back:#333a46}}
*{box-sizing:border-box}
[hidden]{display:none!important}
body{display:flex;flex-direction:column;margin:0;background:var(--back);color:var(--ink);font:15px/1.5 system-ui,"Segoe UI","DejaVu Sans",sans-serif}
header,main,footer{width:100%;max-width:1160px;margin:0 auto;padding:0 24px}
form{display:flex;gap:16px;align-items:center;width:100%;font-size:14px}
#words{flex:1;max-width:420px;font:inherit;padding:6px 10px;color:var(--ink);background:var(--card);border:1px solid var(--line);border-radius:8px}
#found{color:var(--dim)}
header{order:-1;display:flex;flex-wrap:wrap;gap:16px 40px;align-items:flex-end;justify-content:space-between;padding-top:32px;padding-bottom:20px}
h1{font-size:24px;line-height:1.2;margin:0;overflow-wrap:anywhere}
.facts{display:flex;gap:32px}.facts b{display:block;font-size:20px;line-height:1.2}.facts span{color:var(--dim);font-size:13px}
.exchange{background:var(--card);border:1px solid var(--line);border-radius:10px;margin:0 0 8px;overflow:hidden;content-visibility:auto;contain-intrinsic-size:auto 44px}
summary{display:grid;grid-template-columns:16px 36px 84px minmax(120px,190px) 1fr auto;gap:12px;align-items:baseline;padding:10px 16px;cursor:pointer;list-style:none}
summary::-webkit-details-marker{display:none}
summary::before{content:"\25B8";color:var(--dim)}details[open]>summary::before{content:"\25BE"}
summary:hover{background:var(--code)}summary:focus-visible{outline:2px solid var(--tag);outline-offset:-2px}
details[open]>summary{border-bottom:1px solid var(--line)}
.number{color:var(--dim);text-align:right;font-variant-numeric:tabular-nums}
.badge{border-radius:99px;padding:1px 10px;font-size:13px;font-weight:600;text-align:center;white-space:nowrap}
.good{color:var(--good);background:var(--good-back)}.bad{color:var(--bad);background:var(--bad-back)}
.fault{color:var(--fault);background:var(--fault-back)}.none{color:var(--none);background:var(--none-back)}
.operation{font-weight:600;overflow-wrap:anywhere}
.target{color:var(--dim);font-size:13px;overflow-wrap:anywhere}.target em{display:block;color:var(--fault);font-style:normal}
.size{color:var(--dim);font-size:13px;white-space:nowrap;font-variant-numeric:tabular-nums}
abbr{border:1px solid var(--line);border-radius:4px;padding:0 5px;font-size:12px;margin-right:6px}
section{padding:14px 20px 16px}section+section{border-top:1px dashed var(--line)}
h3{font-size:14px;margin:0 0 6px}h3 small{color:var(--dim);font-weight:400;margin-left:8px;font-size:13px}
.request h3::before{content:"\2191";color:var(--tag);margin-right:8px}.answer h3::before{content:"\2193";color:var(--good);margin-right:8px}
.start{font:13px/1.5 ui-monospace,"DejaVu Sans Mono",monospace;margin:0 0 4px;font-weight:600;overflow-wrap:anywhere}
table{border-collapse:collapse;font-size:13px;margin:0 0 10px}th{font-weight:400;color:var(--dim);text-align:left;padding:0 16px 0 0;vertical-align:top;white-space:nowrap}
td{overflow-wrap:anywhere}
pre{font:13px/1.55 ui-monospace,"DejaVu Sans Mono",monospace;margin:0;padding:12px 14px;background:var(--code);border:1px solid var(--line);border-radius:8px;
white-space:pre-wrap;overflow-wrap:anywhere;max-height:70vh;overflow-y:auto}
.part{font-size:13px;color:var(--dim);margin:10px 0 4px}.note{font-size:13px;color:var(--fault);margin:6px 0}
.t{color:var(--tag)}.a{color:var(--attr)}.v{color:var(--value)}.x{color:var(--text);font-weight:500}.c,.n{color:var(--dim)}
.s{color:var(--bad);background:var(--bad-back);border-radius:4px;padding:0 4px}
.names{display:inline}.names::details-content{display:inline}.names:not([open])::details-content{display:none}.names summary{display:inline;padding:0 6px;color:var(--dim);border:1px solid var(--line);border-radius:4px;font-size:12px}
.names[open]>summary{border-bottom:1px solid var(--line);margin-right:6px}
footer{color:var(--dim);font-size:13px;padding-top:16px;padding-bottom:40px}
@media(max-width:760px){summary{grid-template-columns:16px 28px 84px 1fr}.target,.size{grid-column:2/-1}}
)css";

} // namespace cli
