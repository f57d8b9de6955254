// SPDX-License-Identifier: Apache-2.0
// The page: connects to the message server named in the address's fragment (or typed in), asks the
// bundle for a file and shows its answer. docs/protocol.md describes the messages.
import { connect } from "./node_modules/nats.ws/esm/nats.js";

const READ_REQUEST = "/zpr/service/readRequest_cpp";
const READ_RESPONSE = "/zpr/service/readResponse/";
const NOTIFICATION = "/zpr/service/notifyFileSystemRequest";
const SECONDS_TO_WAIT = 60;
const LONGEST_SHOWN = 200_000; // characters of one text

const stateLine = document.querySelector("#state");
const connectionForm = document.querySelector("#connection");
const requestForm = document.querySelector("#request");
const answerArea = document.querySelector("#answer");
const changesArea = document.querySelector("#changes");

let client = null;
let shownText = null; // the bytes of the text that is shown

function element(name, properties = {}, ...children) {
  const made = Object.assign(document.createElement(name), properties);
  made.append(...children);
  return made;
}

function showState(state, text) {
  stateLine.dataset.state = state;
  stateLine.textContent = text;
}

function showError(text) {
  answerArea.replaceChildren(element("p", { className: "error" }, text));
}


function bytesOf(characters) {
  return Uint8Array.from(characters, (character) => character.charCodeAt(0));
}

// A message's JSON, each byte of whose strings becomes one character. A decoder of "latin1" would
// take the bytes from 80 to 9F (hex) for other characters.
function parse(data) {
  const pieces = [];
  for (let begin = 0; begin < data.length; begin += 32_768) {
    pieces.push(String.fromCharCode.apply(null, data.subarray(begin, begin + 32_768)));
  }
  return JSON.parse(pieces.join(""));
}

// The text that bytes from a file are: in `charset`, or else in UTF-8 if they can be, or in a
// Western charset.
function decode(characters, charset = "") {
  const bytes = bytesOf(characters);
  if (charset) {
    return new TextDecoder(charset).decode(bytes);
  }
  try {
    return new TextDecoder("utf-8", { fatal: true }).decode(bytes);
  } catch {
    return new TextDecoder("windows-1252").decode(bytes);
  }
}

function shown(text) {
  return text.length <= LONGEST_SHOWN ? text : `${text.slice(0, LONGEST_SHOWN)}\n[and so on]`;
}

class Client {
  static async connect({ server, user, password }) {
    const connection = await connect({
      servers: server,
      user: user || undefined,
      pass: password || undefined,
      maxReconnectAttempts: -1,
      timeout: 10_000,
    });
    return new Client(connection, user);
  }

  constructor(connection, user) {
    this.connection = connection;
    // Servers let a user see the answers to ids that begin with the user's name and a dot.
    const random = Array.from(crypto.getRandomValues(new Uint32Array(4)), (part) =>
      part.toString(36),
    ).join("");
    this.idPrefix = `${user ? `${user}.` : ""}${random}`;
    this.requests = 0;
  }

  // The bundle's answer to a read request.
  read(path, contentType) {
    // An id for each request, so that a late answer is not taken for another's.
    const rtcId = `${this.idPrefix}-${++this.requests}`;
    return new Promise((resolve, reject) => {
      let subscription = null;
      const timer = setTimeout(() => {
        subscription.unsubscribe();
        reject(
          new Error(
            `There was no answer in ${SECONDS_TO_WAIT} seconds. Either no host is connected to ` +
              "this server, or it is busy; try again.",
          ),
        );
      }, SECONDS_TO_WAIT * 1000);
      subscription = this.connection.subscribe(READ_RESPONSE + rtcId, {
        max: 1,
        callback: (error, message) => {
          clearTimeout(timer);
          try {
            if (error) {
              throw error;
            }
            resolve(parse(message.data));
          } catch (failure) {
            reject(failure);
          }
        },
      });
      const request = { rtcId, contentType, filePath: path };
      this.connection.publish(READ_REQUEST, new TextEncoder().encode(JSON.stringify(request)));
    });
  }

  listen(changed) {
    this.connection.subscribe(NOTIFICATION, {
      callback: (error, message) => error || changed(parse(message.data)),
    });
  }

  async watch(tell) {
    for await (const { type, data } of this.connection.status()) {
      if (type === "disconnect") {
        tell("lost", "Not connected: the server cannot be reached. Trying again.");
      } else if (type === "reconnect") {
        tell("connected", `Connected to ${this.connection.getServer()}`);
      } else if (type === "error") {
        tell("lost", `The server says: ${data}`);
      }
    }
  }
}

function showText() {
  const text = decode(shownText, requestForm.charset.value);
  answerArea.replaceChildren(element("pre", {}, shown(text)));
}

function partBody(part) {
  if (part.content.startsWith("data:image/")) {
    return element("img", { src: part.content, alt: decode(part.partUri) });
  }
  return element("pre", {}, shown(decode(part.content)));
}

function showPart(part) {
  const details = element(
    "details",
    {},
    element(
      "summary",
      {},
      `${decode(part.partUri)} `,
      element("small", {}, `${decode(part.contentType)}, ${part.content.length} bytes`),
    ),
  );
  // Only what is looked at is laid out: documents are large.
  details.addEventListener("toggle", () => details.append(partBody(part)), { once: true });
  return details;
}

function showAnswer(path, answer) {
  if (answer.exception) {
    showError(`${path} cannot be read: ${decode(answer.exception)}`);
  } else if (!answer.status) {
    showError(`There is no document ${path}.`);
  } else if (answer.parts) {
    answerArea.replaceChildren(
      element("h2", {}, `${answer.parts.length} parts`),
      ...answer.parts.map(showPart),
    );
  } else if (answer.data === "") {
    showError(`${path} is empty, or may not be opened.`);
  } else {
    shownText = answer.data;
    showText();
  }
}

function showChange({ filePath, isExistingFile }) {
  changesArea.hidden = false;
  const list = changesArea.querySelector("ul");
  const verb = isExistingFile ? "was written" : "is new";
  list.prepend(
    element("li", {}, `${new Date().toLocaleTimeString()}  ${decode(filePath)} ${verb}`),
  );
  while (list.children.length > 20) {
    list.lastChild.remove();
  }
}

async function open(settings) {
  showState("", "Connecting ...");
  try {
    client = await Client.connect(settings);
  } catch (error) {
    connectionForm.hidden = false;
    showState("lost", `Not connected: ${settings.server} cannot be reached (${error.message}).`);
    return;
  }
  connectionForm.hidden = true;
  sessionStorage.setItem("connection", JSON.stringify(settings));
  showState("connected", `Connected to ${settings.server}`);
  client.listen(showChange);
  client.watch(showState);
}

// What the address's fragment says, which is then taken out of it, so that it is not seen, kept or
// passed on with the address; or what it said before the page was loaded again.
function initialSettings() {
  const settings = Object.fromEntries(new URLSearchParams(location.hash.slice(1)));
  if (settings.server) {
    history.replaceState(null, "", location.pathname + location.search);
    return settings;
  }
  return JSON.parse(sessionStorage.getItem("connection") ?? "null");
}

connectionForm.addEventListener("submit", (event) => {
  event.preventDefault();
  open(Object.fromEntries(new FormData(connectionForm)));
});

requestForm.charset.addEventListener("change", () => shownText === null || showText());

requestForm.addEventListener("submit", async (event) => {
  event.preventDefault();
  const { path, kind } = Object.fromEntries(new FormData(requestForm));
  if (!client) {
    showError("Not connected to a server, so there is nobody to ask.");
    return;
  }
  shownText = null;
  const isDocument = /\.(docx|xlsx|pptx|docm|xlsm|pptm)$/i.test(path);
  answerArea.replaceChildren(element("p", {}, `Reading ${path} ...`));
  try {
    showAnswer(path, await client.read(path, kind || (isDocument ? "text/xml" : "text/plain")));
  } catch (error) {
    showError(error.message);
  }
});

const settings = initialSettings();
if (settings) {
  open(settings);
} else {
  connectionForm.hidden = false;
  showState("lost", "Not connected: say which server to connect to.");
}
