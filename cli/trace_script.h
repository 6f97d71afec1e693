// trace_script.h - the script of a trace's page: search, the filter for failures, colours of what is opened.
//
// Always: text is taken from the page and put back as text, never as markup.
#pragma once

namespace cli {

inline constexpr char TRACE_SCRIPT[] = R"js(
const get = id => document.getElementById(id), all = [...document.querySelectorAll('.exchange')];
let pause;
function filter() {
    const words = get('words').value.toLowerCase(), failed = get('failed').checked;
    let count = 0;
    for (const one of all) {
        one.hidden = failed && !one.classList.contains('failed') || words && !one.textContent.toLowerCase().includes(words);
        count += one.hidden ? 0 : 1;
    }
    get('found').textContent = words || failed ? count + ' of ' + all.length : '';
}
get('find').addEventListener('input', () => { clearTimeout(pause); pause = setTimeout(filter, 200); });
get('find').addEventListener('submit', event => event.preventDefault());
get('find').hidden = false;

// A comment, a tag's name, its end, an attribute's name, its value.
const TOKEN = /(<\!--[^]*?-->|<[?!][^>]*>)|(<\/?[^\s\/>]+|\??\/?>)|([^\s=<>"']+)(?==["'])|("[^"<]*"|'[^'<]*')/g;
function colour(pre) {
    for (const node of [...pre.childNodes].filter(node => node.nodeType === Node.TEXT_NODE)) {
        const text = node.data, made = document.createDocumentFragment();
        let done = 0;
        for (const found of text.matchAll(TOKEN)) {
            const span = document.createElement('span');
            span.className = found[1] ? 'c' : found[2] ? 't' : found[3] ? 'a' : 'v';
            span.textContent = found[0];
            made.append(text.slice(done, found.index), span);
            done = found.index + found[0].length;
        }
        made.append(text.slice(done));
        node.replaceWith(made);
    }
}
function opened(one) {
    if (one.open && !one.dataset.coloured) {
        one.dataset.coloured = 1;
        one.querySelectorAll('pre').forEach(colour);
    }
}
document.addEventListener('toggle', event => event.target.classList.contains('exchange') && opened(event.target), true);
all.forEach(opened);
)js";

} // namespace cli
