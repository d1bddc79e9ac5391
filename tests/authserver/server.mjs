// Starts the example authorization server with an empty database.

import assert from 'node:assert/strict';
import { spawn, execFileSync } from 'node:child_process';
import { once } from 'node:events';
import { mkdirSync, readFileSync, readdirSync, rmSync, writeFileSync } from 'node:fs';
import net from 'node:net';
import path from 'node:path';
import { setTimeout as sleep } from 'node:timers/promises';

const databaseFolder = '/var/packages/Keyloft/target/etc';
const folder = '/var/authserver';
const build = process.env.AUTHSERVER_BUILD;

export const database = `${databaseFolder}/oauth.db`;
export const alice = { name: 'alice', displayName: 'Alice Miller', password: 'open sesame 7' };
export const photoAlbum = {
  redirectUri: 'https://album.example/callback',
  scope: 'read write profile',
  name: 'Photo album',
};
export const printShop = {
  redirectUri: 'https://printer.example/done',
  scope: 'read',
  name: 'Printer',
};

// These tests delete files in /var: it must be the private one.
function requirePrivateVar() {
  const mounts = readFileSync('/proc/self/mountinfo', 'utf8').split('\n');
  const last = mounts.filter((line) => line.split(' ')[4] === '/var').pop();
  if (!last?.includes(' - tmpfs authserver ')) throw new Error('run scripts/test-authserver.sh');
}

async function freePort() {
  const probe = net.createServer().listen(0, '127.0.0.1');
  await once(probe, 'listening');
  const { port } = probe.address();
  probe.close();
  await once(probe, 'close');
  return port;
}

async function answers(port) {
  const socket = net.connect(port, '127.0.0.1');
  try {
    await once(socket, 'connect');
    return true;
  } catch {
    return false;
  } finally {
    socket.destroy();
  }
}

export class Server {
  #process;
  #complaints;

  static async start(settings = {}) {
    requirePrivateVar();
    const server = new Server();
    for (const name of readdirSync(databaseFolder)) rmSync(path.join(databaseFolder, name));
    rmSync(folder, { recursive: true, force: true });
    mkdirSync(folder, { mode: 0o700 });
    server.set(settings);
    server.port = await freePort();
    server.issuer = `http://127.0.0.1:${server.port}`;
    server.setup(['init', folder, '--issuer', server.issuer]);
    server.addUser(alice);
    await server.#run();
    return server;
  }

  async #run() {
    this.#process = spawn(
      'lighttpd',
      ['-D', '-f', `${build}/examples/authserver/lighttpd.conf`],
      {
        stdio: ['ignore', 'inherit', 'pipe'],
        env: {
          PATH: process.env.PATH,
          AUTHSERVER_PORT: String(this.port),
          AUTHSERVER_SOURCE: process.env.AUTHSERVER_SOURCE,
          AUTHSERVER_PROGRAMS: `${build}/examples/authserver/cgi`,
          AUTHSERVER_FOLDER: folder,
        },
      },
    );
    this.#complaints = '';
    this.#process.stderr.on('data', (chunk) => (this.#complaints += chunk));
    while (!(await answers(this.port))) {
      if (this.#process.exitCode !== null)
        throw new Error(`lighttpd did not start: ${this.#complaints}`);
      await sleep(20);
    }
  }

  // Asserts that the log holds only expected lines.
  async stop(expected) {
    this.#process.kill('SIGTERM');
    await once(this.#process, 'close');
    const ofItsOwn = / \(server\.c\.\d+\) (server started|server stopped|\[note\])/;
    const all = this.#complaints + readFileSync(`${folder}/error.log`, 'utf8');
    const lines = all.split('\n').filter((line) => line !== '');
    assert.deepEqual(
      lines.filter((line) => !ofItsOwn.test(line) && !expected?.test(line)),
      [],
    );
  }

  // Writes the library's settings file, which every program reads again.
  set(settings) {
    writeFileSync(`${databaseFolder}/oauth.cfg`, JSON.stringify(settings));
  }

  // Makes the server act as if this were its address.
  actFor(issuer) {
    writeFileSync(`${folder}/config.json`, JSON.stringify({ issuer }));
  }

  setup(words, input = '') {
    return execFileSync(`${build}/examples/authserver/authserver_setup`, words, {
      input,
      stdio: 'pipe',
    });
  }

  // Runs a program with these CGI variables, for requests that the web server would refuse itself.
  runProgram(name, variables) {
    const own = { AUTHSERVER_FOLDER: folder, AUTHSERVER_TEMPLATES: `${process.env.AUTHSERVER_SOURCE}/templates` };
    const env = { ...process.env, ...own, ...variables };
    return String(execFileSync(`${build}/examples/authserver/cgi/${name}`, { env, input: '' }));
  }

  addUser({ name, displayName, password }) {
    this.setup(['add-user', folder, name, '--display-name', displayName], `${password}\n`);
  }

  addClient({ redirectUri, scope, name }) {
    const registered = JSON.parse(
      this.setup(['add-client', '--redirect-uri', redirectUri, '--scope', scope, '--name', name]),
    );
    return { id: registered.client_id, secret: registered.client_secret, redirectUri, scope, name };
  }

  oauthctl(...words) {
    const output = execFileSync(`${build}/tools/oauthctl/oauthctl`, words, { stdio: 'pipe' });
    return words.includes('--json') ? JSON.parse(output) : String(output);
  }

  // Every row that a request may change.
  rows() {
    return {
      codes: this.oauthctl('code', 'list', '--json', '--show-secrets'),
      tokens: this.oauthctl('token', 'list', '--json', '--show-secrets'),
    };
  }

  clear() {
    this.sql('DELETE FROM oauth_grantCode; DELETE FROM oauth_token;');
  }

  sql(statement) {
    return String(execFileSync('sqlite3', ['-cmd', '.timeout 5000', database, statement]));
  }

  log() {
    return this.oauthctl('log', '--json').map((row) => row.msg);
  }

  // Locks the database against others until release(): BEGIN EXCLUSIVE against reading, BEGIN
  // IMMEDIATE against writing.
  async lockDatabase(begin) {
    const locker = spawn('sqlite3', ['-cmd', '.timeout 5000', database], {
      stdio: ['pipe', 'pipe', 'inherit'],
    });
    locker.stdin.write(`${begin};\nSELECT 'locked';\n`);
    await once(locker.stdout, 'data');
    return {
      async release() {
        locker.stdin.end('ROLLBACK;\n');
        await once(locker, 'exit');
      },
    };
  }
}
