// SPDX-License-Identifier: Apache-2.0
// XML as nobody would write it, for properties that have to hold for all of it.

/** Numbers from 0 up to `limit`, the same ones for the same `seed`. */
export function generator(seed) {
  let state = seed;
  return (limit) => {
    state = (Math.imul(state, 1664525) + 1013904223) >>> 0;
    return Math.floor((state / 2 ** 32) * limit);
  };
}

const NAMES = ["a", "b", "w:p", "w:t", "x-y.z", "ü"];
const TEXTS = ["text", " ", "\n  ", "&amp;", "&#x41;", "ü 港 😀", "]]", "a > b", "\t", "\r\n"];
const OTHERS = ["<!-- <a> & -->", "<?do it <now> ?>", "<![CDATA[<b> & ]]>"];

/** A document; `next(limit)` gives the numbers that it is made of. */
export function generateXml(next) {
  const prolog = ["", '<?xml version="1.0"?>', '<?xml version="1.0" encoding="UTF-8"?>\r\n', "<!-- one -->"][next(4)];
  return `${prolog}${generateElement(next, 0)}${["", "\n", "<!-- end -->"][next(3)]}`;
}

function generateElement(next, depth) {
  const name = NAMES[next(NAMES.length)];
  const attributes = ["", ' a="1"', ' xml:space="preserve"', " b='\"&lt;>'", '\n c = "/>" '][next(5)];
  if (next(5) === 0) {
    return `<${name}${attributes}/>`;
  }
  const isMixed = next(3) === 0;
  let content = "";
  for (let count = next(depth > 6 ? 1 : 5); count > 0; --count) {
    const kind = next(isMixed ? 4 : 2);
    content +=
      kind === 0 && !isMixed
        ? OTHERS[next(2)]
        : kind < 2
          ? generateElement(next, depth + 1)
          : kind === 2
            ? TEXTS[next(TEXTS.length)]
            : OTHERS[next(3)];
  }
  return `<${name}${attributes}>${content}</${name}${["", " "][next(2)]}>`;
}
