#include "lumora-local/page.h"

namespace pinwell::lumora {

// Text has a contrast of 4.5 to 1 at least, edges of fields 3 to 1, in both schemes.
std::string_view pageStyle() {
    return R"(:root { color-scheme: light dark; --text: #1b1b1f; --ground: #ffffff; --quiet: #55585f; --link: #0b57d0;
  --line: #c4c7cc; --edge: #70757d; --good: #1a7f37; --bad: #b3261e; --raised: #f4f5f7; }
@media (prefers-color-scheme: dark) { :root { --text: #e8e8ea; --ground: #16181c; --quiet: #a6abb3;
  --link: #8ab4f8; --line: #43474e; --edge: #8b9098; --good: #4ac26b; --bad: #ff8a80; --raised: #212429; } }
* { box-sizing: border-box; }
body { font: 1rem/1.5 system-ui, sans-serif; color: var(--text); background: var(--ground); margin: 0; }
header, main, footer { max-width: 64rem; margin: 0 auto; padding: 0 1rem; }
header { padding-top: 1rem; }
header p { font-weight: 600; margin: 0; }
main { padding-bottom: 2rem; }
footer { border-top: 1px solid var(--line); padding: .8rem 1rem 2rem; color: var(--quiet); font-size: .9rem; }
h1 { font-size: 1.6rem; line-height: 1.25; margin: 1rem 0 .5rem; overflow-wrap: anywhere; }
h2 { font-size: 1.2rem; margin: 1.6rem 0 .4rem; }
h3 { font-size: 1rem; margin: 0; }
a { color: var(--link); overflow-wrap: anywhere; }
:focus-visible { outline: 3px solid var(--link); outline-offset: 2px; }
.skip { position: absolute; left: -999rem; padding: .6rem 1rem; background: var(--raised); }
.skip:focus { left: .5rem; top: .5rem; }
form { display: flex; flex-wrap: wrap; gap: .8rem; align-items: end; background: var(--raised); padding: 1rem;
  border-radius: .4rem; }
form div { display: flex; flex-direction: column; flex: 1 1 10rem; }
form div:first-child { flex: 3 1 16rem; }
form p { flex: 1 1 100%; margin: 0; font-size: .9rem; color: var(--quiet); }
label { font-size: .9rem; font-weight: 600; margin-bottom: .2rem; }
input, select, button { font: inherit; color: inherit; background: var(--ground); border: 1px solid var(--edge);
  border-radius: .3rem; padding: .45rem .6rem; width: 100%; min-height: 2.75rem; }
button { width: auto; padding: .45rem 1.4rem; font-weight: 600; cursor: pointer; }
table { border-collapse: collapse; width: 100%; margin-top: 1rem; }
caption { text-align: left; font-weight: 600; padding-bottom: .4rem; overflow-wrap: anywhere; }
th, td { text-align: left; vertical-align: top; padding: .5rem .8rem .5rem 0; border-top: 1px solid var(--line); }
thead th { border-top: 0; font-size: .9rem; }
tbody th { font-weight: normal; overflow-wrap: anywhere; }
.unit { white-space: nowrap; }
.code { font: .85em/1.6 ui-monospace, monospace; overflow-wrap: anywhere; display: block; color: var(--quiet); }
.state { font-weight: 600; }
.valid { color: var(--good); }
.revoked { color: var(--bad); }
.fault { border-left: .4rem solid var(--bad); padding: .4rem 0 .4rem .8rem; overflow-wrap: anywhere; }
dl { margin: .5rem 0; }
dl div { display: flex; flex-wrap: wrap; gap: 0 1rem; padding: .25rem 0; }
dt { flex: 0 0 9rem; color: var(--quiet); }
dd { margin: 0; flex: 1 1 18rem; min-width: 0; overflow-wrap: anywhere; }
dd ul { margin: 0; padding: 0; list-style: none; }
.events { padding: 0; list-style: none; }
.events p { margin: .2rem 0; }
.events > li { border-top: 1px solid var(--line); padding: .8rem 0; }
.pages { margin: 1rem 0; display: flex; gap: 1.5rem; }
.pages a { display: inline-block; padding: .5rem 0; }
@media print { form, .skip, .pages { display: none; } }
)";
}

}  // namespace pinwell::lumora
