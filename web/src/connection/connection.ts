// SPDX-License-Identifier: Apache-2.0
// The connection to the server, and what is the matter when there is none.
import { type Client, connect } from "../../client/src/index.js";
import { reasonText } from "../ui/text.js";
import type { Settings } from "./settings.js";

/** "refused": the server does not take the user or the password. "closed": it will not connect again by itself. */
export type ConnectionState = "connecting" | "connected" | "lost" | "refused" | "unreachable" | "closed";

export class ConnectionFailure extends Error {
  constructor(
    readonly state: "refused" | "unreachable",
    reason: unknown,
  ) {
    super(reasonText(reason));
  }
}

/** Connects, and tells of every later state of the connection. Throws ConnectionFailure. */
export async function openConnection(
  { server, user, password }: Settings,
  tell: (state: ConnectionState) => void,
): Promise<Client> {
  tell("connecting");
  let client: Client;
  try {
    client = await connect({ servers: server, ...(user && { user }), ...(password && { pass: password }) });
  } catch (error) {
    throw new ConnectionFailure(isRefusal(error) ? "refused" : "unreachable", error);
  }
  tell("connected");
  void watch(client, tell);
  return client;
}

function isRefusal(error: unknown): boolean {
  return error instanceof Error && /authorization|authentication/i.test(`${error.name} ${error.message}`);
}

async function watch(client: Client, tell: (state: ConnectionState) => void): Promise<void> {
  let isRefused = false;
  for await (const status of client.nats.status()) {
    if (status.type === "disconnect") {
      tell("lost");
    } else if (status.type === "reconnect") {
      tell("connected");
    } else if (status.type === "error") {
      isRefused ||= isRefusal(status.error);
    }
  }
  tell(isRefused ? "refused" : "closed");
}
