// SPDX-License-Identifier: Apache-2.0
// Somebody else, who saves while a page is open: the client library under Node.js.
import { connect } from "../../../web/client/dist/index.js";
import { parseUrl } from "../../serve/client.mjs";
import { atEnd } from "../../serve/processes.mjs";
import "../../serve/web_socket.mjs";

/** A client of the session's host. */
export async function clientOf(test, session) {
  const { server, user, password } = parseUrl(session.host.webSocket);
  const client = await connect({ servers: server, user, pass: password });
  atEnd(test, () => client.close());
  return client;
}
