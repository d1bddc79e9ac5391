// A server whose folder lacks a file: every answer reports an error and hides its reason.

import assert from 'node:assert/strict';
import { renameSync } from 'node:fs';
import { after, before, test } from 'node:test';

import { authorizeUrl, issued, logIn } from './code_flow.mjs';
import { FormBrowser } from './form_browser.mjs';
import { bearer, request } from './http.mjs';
import { assertErrorPage, assertRedirected, leavesNoTrace } from './outcomes.mjs';
import { photoAlbum, Server } from './server.mjs';

let server, album;
before(async () => {
  server = await Server.start();
  album = server.addClient(photoAlbum);
});
after(() =>
  server.stop(/^authserver: cannot read \/var\/authserver\/(users\.json|session\.key|config\.json)$/),
);

async function without(name, action) {
  const file = `/var/authserver/${name}`;
  renameSync(file, `${file}.away`);
  await leavesNoTrace(server, action);
  renameSync(`${file}.away`, file);
}

const ask = (changes) => request(server.issuer + authorizeUrl(album, changes));

test('a failure at /authorize goes back to the client as server_error', async () => {
  const browser = new FormBrowser(server);
  await browser.open(authorizeUrl(album));
  for (const name of ['users.json', 'session.key'])
    await without(name, async () => {
      assertRedirected(await ask(), server, album, 'server_error');
    });
  await without('users.json', async () =>
    assertRedirected(await logIn(browser), server, album, 'server_error', { status: 303 }),
  );
});

test('a failure without a valid redirect URI gets a page and no redirect', async () => {
  await without('session.key', async () => {
    assertErrorPage(await ask({ redirect_uri: 'https://evil.example/' }), 400);
    assertErrorPage(await ask({ client_id: 'x' }), 400);
  });
  await without('config.json', async () => assertErrorPage(await ask(), 500));
});

test('a failure at another endpoint is 500 and hides its reason', async () => {
  const { access_token: token } = await issued(server, album);
  await without('users.json', async () => {
    const answer = await request(`${server.issuer}/userinfo`, { headers: bearer(token) });
    assert.deepEqual(
      [answer.status, answer.json],
      [500, { error: 'server_error', error_description: 'Something went wrong on the server.' }],
    );
  });
});
