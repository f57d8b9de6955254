// SPDX-License-Identifier: Apache-2.0
// The page's start: takes the password out of the address, connects, and shows the workspace.
import { ConnectionFailure, type ConnectionState, openConnection } from "./connection/connection.js";
import { loginForm } from "./connection/login.js";
import { type Settings, completeSettings, fragmentOf, readFragment, remember } from "./connection/settings.js";
import { type Draft, Drafts, ownWindow } from "./save/drafts.js";
import { lastingStore, sessionStore } from "./storage.js";
import { element } from "./ui/dom.js";
import { Messages } from "./ui/messages.js";
import { preferredLanguage, reasonText, text, useLanguage } from "./ui/text.js";
import { chosenTheme, useTheme } from "./ui/theme.js";
import { Workspace } from "./ui/workspace.js";
// Here, since nothing would load the style sheets of chunks.
import "./ui/page.css";
import "./files/files.css";
import "./images/images.css";
import "./text/text.css";
import "./package/package.css";

const language = preferredLanguage(lastingStore.getItem("language"), navigator.languages);
useLanguage(language);
document.documentElement.lang = language;
useTheme(chosenTheme());

const messages = new Messages();
const stage = element("div", { className: "stage" });
document.body.append(stage, messages.element);
document.title = text("page.title");
let workspace: Workspace | undefined;
let connected: Settings | undefined;
const ownId = ownWindow(); // before it is connected, so that no other window takes its drafts meanwhile
let attempts = 0; // to connect; nothing is heard any more of those before the last one

// Does what the address says: connects, or shows a document.
function follow(): void {
  const address = readFragment(location.hash);
  const known = completeSettings(address, sessionStore, lastingStore);
  // At once, so that the password is not seen, kept or passed on with the address.
  history.replaceState(null, "", location.pathname + location.search + fragmentOf(known, address.file));
  if (workspace && !address.password && known.server === connected?.server) {
    if (address.file) {
      workspace.open(address.file).focus();
    }
  } else if (known.server && known.password) {
    void start({ server: known.server, user: known.user ?? "", password: known.password }, address.file);
  } else {
    askToConnect(known, "", address.file);
  }
}

async function start(settings: Settings, file?: string): Promise<void> {
  const attempt = ++attempts;
  stage.replaceChildren(element("p", { className: "waiting", role: "status" }, text("connection.connecting")));
  try {
    const client = await openConnection(settings, (state) => attempt === attempts && connectionChanged(state, settings));
    if (attempt !== attempts) {
      return void client.close();
    }
    connected = settings;
    remember(settings, sessionStore, lastingStore);
    if (workspace) {
      workspace.reconnected(client, settings);
      if (file) {
        workspace.open(file);
      }
    } else {
      const drafts = await Drafts.open(await ownId);
      workspace = new Workspace({ client, settings, drafts, messages });
      workspace.restore(await drafts.take().catch(untaken), file);
    }
    stage.replaceChildren(workspace.element);
  } catch (error) {
    if (!(error instanceof ConnectionFailure)) {
      throw error;
    }
    askToConnect(settings, text(`connection.${error.state}`, { server: settings.server }), file);
  }
}

function untaken(reason: unknown): Draft[] {
  messages.tell(text("drafts.failed", { reason: reasonText(reason) }), "problem");
  return [];
}

function connectionChanged(state: ConnectionState, settings: Settings): void {
  workspace?.connection(state);
  if (workspace && (state === "refused" || state === "closed")) {
    askToConnect(settings, text(`connection.${state}`));
  }
}

// What is open stays as it is while this is asked.
function askToConnect(settings: Partial<Settings>, wrong = "", file?: string): void {
  stage.replaceChildren(loginForm(settings, wrong, (typed) => void start(typed, file)));
}

follow();
// The person has entered another address of the page, which does not load it again.
addEventListener("hashchange", follow);
