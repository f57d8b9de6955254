// SPDX-License-Identifier: Apache-2.0
// Where to connect to: what the address says, and what was said before the page was loaded again.
import type { Store } from "../storage.js";

export interface Settings {
  server: string;
  user: string;
  password: string;
}

/** What an address may say in its fragment. */
export interface Address extends Partial<Settings> {
  /** The path of the document to show. */
  file?: string;
}

/** What `fragment`, with or without its "#", says. */
export function readFragment(fragment: string): Address {
  const said = new URLSearchParams(fragment.replace(/^#/, ""));
  const address: Address = {};
  for (const key of ["server", "user", "password", "file"] as const) {
    const value = said.get(key);
    if (value) {
      address[key] = value;
    }
  }
  return address;
}

/** The fragment of a link to a document. It never holds the password. */
export function fragmentOf({ server, user }: Partial<Settings>, file?: string): string {
  const said = new URLSearchParams();
  for (const [key, value] of Object.entries({ server, user, file })) {
    if (value) {
      said.set(key, value);
    }
  }
  return said.size > 0 ? `#${said}` : "";
}

const KEY = "connection";

/**
 * What `address` says, completed by what is remembered of the same server and user. `session` ends with the
 * browser's tab and may therefore hold the password; `lasting` does not.
 */
export function completeSettings(address: Address, session: Store, lasting: Store): Partial<Settings> {
  for (const store of [session, lasting]) {
    const known: Partial<Settings> = JSON.parse(store.getItem(KEY) ?? "{}");
    const isSame =
      (!address.server || address.server === known.server) && (!address.user || address.user === known.user);
    if (known.server && isSame) {
      return { ...known, ...(address.password && { password: address.password }) };
    }
  }
  const { server, user, password } = address;
  return { ...(server && { server }), ...(user && { user }), ...(password && { password }) };
}

/** Remembers settings that a connection was made with. */
export function remember({ server, user, password }: Settings, session: Store, lasting: Store): void {
  session.setItem(KEY, JSON.stringify({ server, user, password }));
  lasting.setItem(KEY, JSON.stringify({ server, user }));
}
