// SPDX-License-Identifier: Apache-2.0
// Texts in many charsets, encoded by Python's codecs, which neither the page nor the host know of.
import { spawnSync } from "node:child_process";

const GERMAN = "Falsches Üben von Xylophonmusik quält jeden größeren Zwerg, sagte der Bäcker und öffnete die Tür.";
const FRENCH = "Dès Noël, où un zéphyr haï me vêt de glaçons würmiens, je dîne d’exquis rôtis à l’aÿ d’âge mûr.";
const POLISH = "Zażółć gęślą jaźń. Pchnąć w tę łódź jeża lub ośm skrzyń fig. Książka leży na półce.";
const RUSSIAN = "Съешь же ещё этих мягких французских булок, да выпей чаю. Широкая электрификация южных губерний.";
const UKRAINIAN = "Чуєш їх, доцю, га? Кумедна ж ти, прощайся без ґольфів! Її привітний голос лунав у хаті.";
const GREEK = "Ξεσκεπάζω την ψυχοφθόρα βδελυγμία. Η γρήγορη αλεπού πηδά πάνω από το τεμπέλικο σκυλί.";
const TURKISH = "Pijamalı hasta yağız şoföre çabucak güvendi. Öküz ağaçların gölgesinde çığlık attı.";
const HEBREW = "דג סקרן שט בים מאוכזב ולפתע מצא חברה. שלום לכולם, מה שלומכם היום?";
const ARABIC = "نص حكيم له سر قاطع وذو شأن عظيم مكتوب على ثوب أخضر ومغلف بجلد أزرق.";
const LITHUANIAN = "Įlinkdama fechtuotojo špaga sublykčiojusi pragręžė apvalų arbūzą. Žąsys ėjo per žolę.";
const VIETNAMESE = "Tôi có thể ăn thủy tinh mà không hại gì. Người Việt Nam rất thân thiện với mọi người.";
const THAI = "เป็นมนุษย์สุดประเสริฐเลิศคุณค่า กว่าบรรดาฝูงสัตว์เดรัจฉาน จงฝ่าฟันพัฒนาวิชาการ";
const JAPANESE = "いろはにほへと ちりぬるを。色は匂へど散りぬるを、我が世誰ぞ常ならむ。カタカナも使います。";
const SIMPLIFIED = "我能吞下玻璃而不伤身体。春眠不觉晓，处处闻啼鸟。夜来风雨声，花落知多少。";
const TRADITIONAL = "我能吞下玻璃而不傷身體。春眠不覺曉，處處聞啼鳥。夜來風雨聲，花落知多少。";
const KOREAN = "나는 유리를 먹을 수 있어요. 그래도 아프지 않아요. 키스의 고유조건은 입술끼리 만나야 한다.";
const KAZAKH = "Мен шыны жей аламын, ол маған зиян келтірмейді. Қазақстан Республикасының ұлттық тілі, әңгіме.";

// By the page's name of the charset: Python's name, and the text.
const SAMPLES = {
  "UTF-8": ["utf-8", JAPANESE],
  "UTF-16LE": ["utf-16-le", RUSSIAN],
  "UTF-16BE": ["utf-16-be", GREEK],
  "UTF-32LE": ["utf-32-le", KOREAN],
  "UTF-32BE": ["utf-32-be", FRENCH],
  Shift_JIS: ["cp932", JAPANESE],
  "EUC-JP": ["euc_jp", JAPANESE],
  GB18030: ["gb18030", SIMPLIFIED],
  GBK: ["gbk", SIMPLIFIED],
  Big5: ["big5", TRADITIONAL],
  "Big5-HKSCS": ["big5hkscs", TRADITIONAL],
  "EUC-KR": ["cp949", KOREAN],
  Johab: ["johab", KOREAN],
  "windows-1250": ["cp1250", POLISH],
  "windows-1251": ["cp1251", RUSSIAN],
  "windows-1252": ["cp1252", GERMAN],
  "windows-1253": ["cp1253", GREEK],
  "windows-1254": ["cp1254", TURKISH],
  "windows-1255": ["cp1255", HEBREW],
  "windows-1256": ["cp1256", ARABIC],
  "windows-1257": ["cp1257", LITHUANIAN],
  "windows-1258": ["cp1258", GERMAN],
  "windows-874": ["cp874", THAI],
  "ISO-8859-1": ["iso8859-1", GERMAN],
  "ISO-8859-2": ["iso8859-2", POLISH],
  "ISO-8859-5": ["iso8859-5", RUSSIAN],
  "ISO-8859-7": ["iso8859-7", GREEK],
  "ISO-8859-8": ["iso8859-8", HEBREW],
  "ISO-8859-9": ["iso8859-9", TURKISH],
  "ISO-8859-13": ["iso8859-13", LITHUANIAN],
  "ISO-8859-15": ["iso8859-15", GERMAN],
  "KOI8-R": ["koi8-r", RUSSIAN],
  "KOI8-U": ["koi8-u", UKRAINIAN],
  "KZ-1048": ["kz1048", KAZAKH],
  IBM437: ["cp437", GERMAN],
  IBM850: ["cp850", GERMAN],
  IBM852: ["cp852", POLISH],
  IBM855: ["cp855", RUSSIAN],
  IBM862: ["cp862", HEBREW],
  IBM866: ["cp866", RUSSIAN],
  macintosh: ["mac-roman", FRENCH],
  "x-mac-cyrillic": ["mac-cyrillic", RUSSIAN],
  IBM037: ["cp037", GERMAN],
};

const SCRIPT = `
import json, sys
asked = json.load(sys.stdin)
json.dump({name: text.encode(codec).hex() for name, (codec, text) in asked.items()}, sys.stdout)
`;

function encode(asked) {
  const { status, stdout, stderr } = spawnSync("python3", ["-c", SCRIPT], { input: JSON.stringify(asked), encoding: "utf8" });
  if (status !== 0) {
    throw new Error(stderr);
  }
  return JSON.parse(stdout);
}

/** Of each charset: the bytes of a text of several lines, its last character, and that one's bytes. */
export function samples() {
  const entries = Object.entries(SAMPLES);
  const lines = (text) => `${text}\r\n${text}\r\n${text}`;
  const letter = (text) => [...text].findLast((character) => /\p{L}/u.test(character));
  const texts = encode(Object.fromEntries(entries.map(([name, [codec, text]]) => [name, [codec, lines(text)]])));
  const letters = encode(Object.fromEntries(entries.map(([name, [codec, text]]) => [name, [codec, letter(text)]])));
  return entries.map(([name, [, text]]) => ({
    name,
    bytes: Buffer.from(texts[name], "hex"),
    text: text,
    letter: letter(text),
    letterBytes: Buffer.from(letters[name], "hex"),
  }));
}
