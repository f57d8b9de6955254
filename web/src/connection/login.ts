// SPDX-License-Identifier: Apache-2.0
// The form that asks where to connect to.
import { element } from "../ui/dom.js";
import { text } from "../ui/text.js";
import type { Settings } from "./settings.js";

/** A form with what is `known`, that tells what is `wrong` and calls `submitted` with what is typed. */
export function loginForm(
  known: Partial<Settings>,
  wrong: string,
  submitted: (settings: Settings) => void,
): HTMLElement {
  const server = element("input", { name: "server", required: true, spellcheck: false, value: known.server ?? "" });
  server.placeholder = "ws://127.0.0.1:4223";
  const user = element("input", { name: "user", autocomplete: "username", value: known.user ?? "" });
  const password = element("input", { name: "password", type: "password", autocomplete: "current-password" });
  const form = element(
    "form",
    { className: "login" },
    element("h1", {}, text("login.title")),
    ...(wrong ? [element("p", { className: "problem", role: "alert" }, wrong)] : []),
    element("label", {}, text("login.server"), server),
    element("label", {}, text("login.user"), user),
    element("label", {}, text("login.password"), password),
    element("button", { className: "main" }, text("login.connect")),
  );
  form.addEventListener("submit", (event) => {
    event.preventDefault();
    submitted({ server: server.value.trim(), user: user.value.trim(), password: password.value });
  });
  queueMicrotask(() => (known.server ? password : server).focus());
  return element("main", {}, form);
}
