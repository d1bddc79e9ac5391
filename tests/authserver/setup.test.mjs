// authserver_setup: what it accepts and what it refuses.

import assert from 'node:assert/strict';
import { existsSync, readFileSync, rmSync, writeFileSync } from 'node:fs';
import { after, afterEach, before, test } from 'node:test';

import { authorizeUrl, logIn } from './code_flow.mjs';
import { FormBrowser } from './form_browser.mjs';
import { alice, photoAlbum, Server } from './server.mjs';

const users = '/var/authserver/users.json';
let server, album, original;
before(async () => {
  server = await Server.start();
  album = server.addClient(photoAlbum);
  original = readFileSync(users, 'utf8');
});
after(() => server.stop());
afterEach(() => writeFileSync(users, original));

const password = 'correct horse';
const add = (name, input) =>
  server.setup(['add-user', '/var/authserver', name, '--display-name', 'Bob'], input);

function assertNotAdded(name, input, complaint) {
  assert.throws(
    () => add(name, input),
    ({ status, stderr }) => status === 1 && String(stderr) === `authserver_setup: ${complaint}\n`,
    JSON.stringify([name, input]),
  );
  assert.equal(readFileSync(users, 'utf8'), original);
}

async function heading(user) {
  const browser = new FormBrowser(server);
  await browser.open(authorizeUrl(album));
  const { text } = await logIn(browser, user);
  return /<h1>([^<]*)/.exec(text)[1];
}

test('names that are empty, too long or hold control characters are refused', () => {
  for (const name of ['', 'x'.repeat(257), 'a\nb', 'a\tb', 'a\x7fb', '\x1b[2J'])
    assertNotAdded(name, `${password}\n`, 'a name has 1 to 256 bytes and no control characters');
});

test('a name of 256 bytes can log in', async () => {
  const bob = { name: 'x'.repeat(256), displayName: 'Bob', password };
  server.addUser(bob);
  assert.equal(await heading(bob), 'Allow Photo album?');
});

test('nobody can log in with the empty name, even if users.json contains it', async () => {
  const document = JSON.parse(original);
  document.users[''] = document.users[alice.name];
  writeFileSync(users, JSON.stringify(document));
  const { text } = await new FormBrowser(server).open(authorizeUrl(album));
  assert.match(text, /<h1>Log in<\/h1>/);
  assert.equal(await heading({ name: '', password: alice.password }), 'Log in');
  assert.equal(await heading(alice), 'Allow Photo album?');
});

test('passwords that are empty, too short, too long or hold control characters are refused', () => {
  for (const input of [
    '',
    '\n',
    '\r\n',
    'seven 7\r\n',
    `${'x'.repeat(1025)}\n`,
    `tabbed\t${password}\n`,
    `${password}\r\r\n`,
    `${password}\0\n`,
  ])
    assertNotAdded('bob', input, 'a password has 8 to 1024 bytes and no control characters');
});

test('a password is the first line, whatever its line ending', async () => {
  const ends = ['', '\n', '\r\n', '\nsecond line\n'];
  for (const [i, end] of ends.entries()) {
    add(`bob${i}`, password + end);
    assert.equal(await heading({ name: `bob${i}`, password }), 'Allow Photo album?');
  }
  const longest = { name: 'carol', displayName: 'Carol', password: 'x'.repeat(1024) };
  server.addUser(longest);
  assert.equal(await heading(longest), 'Allow Photo album?');
});

const refusedIssuers = [
  '',
  'login.example',
  'https://',
  'https://login.example/',
  'https://login.example/path',
  'https://login.example?query',
  'https://login.example#fragment',
  'https://user@login.example',
  'https://login.example ',
  'https://login .example',
  'https://login.example:',
  'https://login.example:port',
  'HTTPS://login.example',
  'https://https://login.example',
  'ftp://login.example',
  'com.example.login:/',
  'http://login.example',
  'http://127.0.0.1.login.example',
];
const acceptedIssuers = [
  'https://login.example',
  'https://login.example:8443',
  'https://[2001:db8::1]',
  'http://127.0.0.1:8080',
  'http://[::1]',
  'http://localhost',
];
test('an issuer is https, or http on this machine, and ends after its host or port', () => {
  const init = (folder, issuer) => server.setup(['init', folder, '--issuer', issuer]);
  for (const issuer of refusedIssuers) {
    assert.throws(
      () => init('/var/refused', issuer),
      ({ status, stderr }) =>
        status === 1 &&
        String(stderr) ===
          'authserver_setup: the issuer must be https://HOST[:PORT], or http on this machine\n',
      issuer,
    );
    assert.equal(existsSync('/var/refused'), false);
  }
  for (const issuer of acceptedIssuers) {
    init('/var/accepted', issuer);
    assert.deepEqual(JSON.parse(readFileSync('/var/accepted/config.json', 'utf8')), { issuer });
    rmSync('/var/accepted', { recursive: true });
  }
});
