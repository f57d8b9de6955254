// SPDX-License-Identifier: Apache-2.0
// A message server with the packaged limits and users, and workers for it.
import { readFileSync, writeFileSync } from "node:fs";
import { createServer } from "node:net";
import { join } from "node:path";

import { connect } from "../../web/client/dist/index.js";
import { HOST, Program, ROOT, atEnd, waitFor } from "./processes.mjs";
import "./web_socket.mjs";

export async function freePorts(count) {
  const servers = Array.from({ length: count }, () => createServer().listen(0, "127.0.0.1"));
  return Promise.all(
    servers.map(async (server) => {
      await new Promise((resolve) => server.once("listening", resolve));
      const { port } = server.address();
      await new Promise((resolve) => server.close(resolve));
      return port;
    }),
  );
}

const packaged = (file) => readFileSync(join(ROOT, "packaging/nats", file), "utf8");

const PASSWORD = "secret";

// The memory of a process in bytes, now and at its peak.
export function memoryOf(program) {
  const status = readFileSync(`/proc/${program.id}/status`, "utf8");
  const value = (name) => Number(status.match(new RegExp(`^${name}:\\s+(\\d+) kB`, "m"))[1]) * 1024;
  return { now: value("VmRSS"), peak: value("VmHWM") };
}

export class MessageServer {
  // Its files are in `folder`. Users are "ada" and "ben".
  static async start(test, folder, maxPayload = "8MB", environment = {}) {
    const [port, webSocketPort, monitoringPort] = await freePorts(3);
    const server = new MessageServer();
    Object.assign(server, { test, folder, port, webSocketPort, monitoringPort, environment });
    server.configuration = join(folder, "nats.conf");
    writeFileSync(
      server.configuration,
      [
        `listen: "127.0.0.1:${port}"`,
        `websocket: { listen: "127.0.0.1:${webSocketPort}", no_tls: true }`,
        `http: "127.0.0.1:${monitoringPort}"`,
        ...["WORKER", "ADA", "BEN"].map((user) => `${user}_PASSWORD: "${PASSWORD}"`),
        packaged("limits.conf").replace(/^max_payload: .*$/m, `max_payload: ${maxPayload}`),
        packaged("users.conf").replace('include "secrets.conf"', ""),
      ].join("\n"),
    );
    writeFileSync(join(folder, "password"), `${PASSWORD}\n`);
    await server.run();
    return server;
  }

  // Starts it, again if it has been killed.
  async run() {
    const path = `${process.env.PATH}:/usr/sbin`;
    const environment = { PATH: path, ...this.environment };
    this.program = new Program(this.test, ["nats-server", "-c", this.configuration], environment);
    await waitFor("the message server", () => {
      if (this.program.hasEnded) {
        throw new Error(this.program.errors);
      }
      return this.program.errors.includes("Server is ready");
    });
  }

  kill() {
    return this.program.kill();
  }

  // What it tells about itself at `path`.
  async told(path) {
    return (await fetch(`http://127.0.0.1:${this.monitoringPort}/${path}`)).json();
  }

  async connections() {
    return (await this.told("connz?auth=1&limit=4096")).connections;
  }

  // A worker with `documents` as its root.
  async startWorker(documents, args = []) {
    // One that was just killed may still be among the connections, and is gone a moment later.
    const before = new Set((await this.#workerConnections()).map(({ cid }) => cid));
    const worker = new Program(this.test, [
      ...[HOST, "--log-level", "info", ...args, "serve", "--root", documents, "--no-history"],
      ...["--nats", `nats://127.0.0.1:${this.port}`, "--nats-user", "worker"],
      ...["--nats-password-file", join(this.folder, "password")],
    ]);
    await waitFor("the worker", async () => {
      if (worker.hasEnded) {
        throw new Error(worker.errors);
      }
      const added = (await this.#workerConnections()).filter(({ cid }) => !before.has(cid));
      // To writes, to other requests, and to offers.
      return [1, 2, 4].every((count) => added.some(({ subscriptions }) => subscriptions === count));
    });
    return worker;
  }

  async #workerConnections() {
    return (await this.connections()).filter((one) => one.authorized_user === "worker");
  }

  // A connected client library; by way of `port`, if that is another.
  async connect(user, { port = this.webSocketPort, ...options } = {}) {
    const servers = `ws://127.0.0.1:${port}`;
    const client = await connect({ servers, user, pass: PASSWORD, reconnectTimeWait: 100, ...options });
    atEnd(this.test, () => client.close());
    return client;
  }
}
