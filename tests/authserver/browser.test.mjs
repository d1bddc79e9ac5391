// A person with a real browser.

import assert from 'node:assert/strict';
import { once } from 'node:events';
import { readFileSync } from 'node:fs';
import http from 'node:http';
import { after, afterEach, before, test } from 'node:test';

import { launch, openWindow } from './chromium.mjs';
import { authorizeUrl, exchangeCode } from './code_flow.mjs';
import { assertTokens } from './outcomes.mjs';
import { alice, photoAlbum, Server } from './server.mjs';

const axe = readFileSync(new URL('node_modules/axe-core/axe.min.js', import.meta.url), 'utf8');
const phone = {
  viewport: { width: 360, height: 640 },
  isMobile: true,
  hasTouch: true,
  deviceScaleFactor: 2,
};
const script = `"'><script>alert(1)</script><img src=x onerror=alert(1)>`;
const mallory = { name: 'mallory', displayName: script, password: 'open sesame 8' };
let server, application, callbacks, browser, album, remote, hostile;

before(async () => {
  server = await Server.start();
  server.addUser(mallory);
  application = http
    .createServer((request, answer) => {
      const framing = request.url === '/frame';
      if (request.url.startsWith('/callback'))
        callbacks.push(new URL(request.url, server.issuer).searchParams);
      answer.setHeader('content-type', 'text/html');
      answer.end(
        framing
          ? `<iframe src="${server.issuer}${authorizeUrl(album)}"></iframe>`
          : '<h1>Back again</h1>',
      );
    })
    .listen(0, '127.0.0.1');
  await once(application, 'listening');
  const here = `http://127.0.0.1:${application.address().port}`;
  album = server.addClient({
    redirectUri: `${here}/callback`,
    scope: 'read write profile',
    name: 'Photo album',
  });
  remote = server.addClient(photoAlbum);
  hostile = server.addClient({
    redirectUri: `${here}/callback?"'><script>`,
    scope: '<script>alert(1)</script>',
    name: script.slice(0, 64),
  });
  browser = await launch();
});
after(async () => {
  await browser?.close();
  application.close();
  await server.stop();
});
afterEach(() => {
  server.clear();
  callbacks = [];
});
callbacks = [];

// Runs the steps in a window and asserts that its page caused no console message or error.
async function inWindow(options, steps) {
  const { page, complaints, close } = await openWindow(browser, options);
  try {
    await steps(page);
    assert.deepEqual(complaints, []);
  } finally {
    await close();
  }
}

const open = (page, client = album, changes = {}) =>
  page.goto(server.issuer + authorizeUrl(client, changes));
const heading = (page, name) => page.getByRole('heading', { level: 1, name }).waitFor();
const button = (page, name) => page.getByRole('button', { name, exact: true });

async function logIn(page, { name, password } = alice) {
  await page.getByLabel('Name').fill(name);
  await page.getByLabel('Password').fill(password);
  await button(page, 'Log in').click();
}

async function assertAllowed() {
  assert.equal(callbacks.length, 1);
  const { code, ...rest } = Object.fromEntries(callbacks[0]);
  assert.deepEqual(rest, { state: 'as it was', iss: server.issuer });
  assertTokens(await exchangeCode(server, album, code), { scope: 'read write profile' });
}

const windows = {
  'on a desk': {},
  'without JavaScript': { javaScriptEnabled: false },
  'on a phone': phone,
  'on a phone without JavaScript': { ...phone, javaScriptEnabled: false },
  'in the dark': { colorScheme: 'dark' },
};
for (const [where, options] of Object.entries(windows)) {
  test(`a person logs in and allows ${where}`, () =>
    inWindow(options, async (page) => {
      await open(page);
      await heading(page, 'Log in');
      await logIn(page);
      await heading(page, 'Allow Photo album?');
      await page.getByText('You are logged in as Alice Miller').waitFor();
      assert.deepEqual(await page.getByRole('listitem').allTextContents(), [
        'See your photos and albums',
        'Add, change and delete your photos and albums',
        'Know your name',
      ]);
      await page.getByText(`you go back to ${new URL(album.redirectUri).host}`).waitFor();
      await button(page, 'Allow').click();
      await heading(page, 'Back again');
      await assertAllowed();
    }));

  test(`a person denies ${where}`, () =>
    inWindow(options, async (page) => {
      await open(page);
      await logIn(page);
      await button(page, 'Deny').click();
      await heading(page, 'Back again');
      const { error_description: description, ...rest } = Object.fromEntries(callbacks[0]);
      assert.ok(description);
      assert.deepEqual(rest, { error: 'access_denied', state: 'as it was', iss: server.issuer });
      assert.deepEqual(server.rows(), { codes: [], tokens: [] });
    }));

  test(`a wrong password is reported beside its field and can be corrected ${where}`, () =>
    inWindow(options, async (page) => {
      await open(page);
      await logIn(page, { name: 'alice', password: 'wrong password' });
      assert.equal(await page.getByRole('alert').textContent(), 'Name or password is wrong.');
      for (const label of ['Name', 'Password']) {
        const field = page.getByLabel(label);
        assert.equal(await field.getAttribute('aria-invalid'), 'true');
        assert.equal(
          await field.getAttribute('aria-describedby'),
          await page.getByRole('alert').getAttribute('id'),
        );
      }
      assert.equal(await page.getByLabel('Name').inputValue(), 'alice');
      assert.equal(await page.getByLabel('Password').inputValue(), '');
      assert.deepEqual(server.rows(), { codes: [], tokens: [] });
      await logIn(page);
      await button(page, 'Allow').click();
      await heading(page, 'Back again');
      await assertAllowed();
    }));
}

test('a person who is logged in needs no password and can change the account', () =>
  inWindow({}, async (page) => {
    await open(page);
    await logIn(page);
    await open(page);
    await heading(page, 'Allow Photo album?');
    await button(page, 'Not you? Use another account').click();
    await heading(page, 'Log in');
    await open(page);
    await heading(page, 'Log in');
  }));

test('everything can be done with the keyboard, and the focus is visible', () =>
  inWindow({}, async (page) => {
    const focused = async () => {
      const element = page.locator(':focus-visible');
      const outline = await element.evaluate((node) => getComputedStyle(node).outlineStyle);
      assert.notEqual(outline, 'none');
      return element.evaluate((node) => node.labels?.[0]?.textContent ?? node.textContent);
    };
    const tab = async () => {
      await page.keyboard.press('Tab');
      return focused();
    };
    await open(page);
    assert.equal(await tab(), 'Name');
    await page.keyboard.type(alice.name);
    assert.equal(await tab(), 'Password');
    await page.keyboard.type(alice.password);
    assert.equal(await tab(), 'Log in');
    await page.keyboard.press('Space');
    await heading(page, 'Allow Photo album?');
    assert.deepEqual(
      [await tab(), await tab(), await tab()],
      ['Not you? Use another account', 'Allow', 'Deny'],
    );
    await page.keyboard.press('Shift+Tab');
    await page.keyboard.press('Enter');
    await heading(page, 'Back again');
    await assertAllowed();
  }));

test('Enter in the password field logs in', () =>
  inWindow({}, async (page) => {
    await open(page);
    await page.getByLabel('Name').fill(alice.name);
    await page.getByLabel('Password').fill(alice.password);
    await page.keyboard.press('Enter');
    await heading(page, 'Allow Photo album?');
  }));

async function assertAccessible(page) {
  await page.evaluate(axe);
  const { violations, passes } = await page.evaluate(() =>
    globalThis.axe.run({
      runOnly: ['wcag2a', 'wcag2aa', 'wcag21a', 'wcag21aa', 'wcag22aa', 'best-practice'],
    }),
  );
  assert.deepEqual(
    violations.map(({ id, nodes }) => [id, nodes.map((node) => node.html)]),
    [],
  );
  assert.ok(passes.some(({ id }) => id === 'color-contrast'));
}

for (const [where, options] of Object.entries({
  'on a desk': {},
  'on a phone': phone,
  'in the dark': { colorScheme: 'dark' },
}))
  test(`the pages meet WCAG 2.2 AA as far as a program can tell ${where}`, () =>
    inWindow(options, async (page) => {
      await open(page);
      await assertAccessible(page);
      await logIn(page, { name: 'alice', password: 'wrong password' });
      await page.getByRole('alert').waitFor();
      await assertAccessible(page);
      await logIn(page);
      await heading(page, 'Allow Photo album?');
      await assertAccessible(page);
      for (const role of ['main', 'list']) assert.equal(await page.getByRole(role).count(), 1);
    }));

test('the error page meets WCAG 2.2 AA as far as a program can tell', async () => {
  const { page, close } = await openWindow(browser);
  await open(page, { ...album, id: 'unknown' });
  await assertAccessible(page);
  await close();
});

test('the pages fit on a narrow phone and buttons are large enough, also with long names', () =>
  inWindow({ ...phone, viewport: { width: 320, height: 480 } }, async (page) => {
    const long = server.addClient({
      redirectUri: `https://${'l'.repeat(60)}.${'l'.repeat(60)}.example/`,
      scope: 's'.repeat(200),
      name: 'W'.repeat(64),
    });
    await open(page, long);
    const assertFits = async () => {
      const width = await page.evaluate(() => document.documentElement.scrollWidth);
      assert.ok(width <= 320, `${width} px wide`);
      for (const shown of await page.getByRole('button').all()) {
        const { height } = await shown.boundingBox();
        assert.ok(height >= 24, `${height} px high`);
      }
    };
    await assertFits();
    await logIn(page);
    await heading(page, `Allow ${long.name}?`);
    await assertFits();
  }));

test('scripts in every field are shown as text and do not run', () =>
  inWindow({}, async (page) => {
    const assertHarmless = async () => {
      assert.equal(await page.locator('script, img, iframe, object, embed, svg, style').count(), 0);
      assert.equal(await page.locator('[onerror], [onload], [onclick], [style]').count(), 0);
    };
    await open(page, hostile, { state: script });
    await assertHarmless();
    await logIn(page, { name: script, password: 'x' });
    await page.getByRole('alert').waitFor();
    assert.equal(await page.getByLabel('Name').inputValue(), script);
    await assertHarmless();
    await logIn(page, mallory);
    await heading(page, `Allow ${hostile.name}?`);
    assert.equal(
      await page.getByRole('paragraph').locator('strong').first().textContent(),
      mallory.displayName,
    );
    assert.deepEqual(await page.getByRole('listitem').allTextContents(), [
      '<script>alert(1)</script>',
    ]);
    await assertHarmless();
    await button(page, 'Allow').click();
    await heading(page, 'Back again');
    assert.equal(callbacks[0].get('state'), script);
  }));

test('scripts in a refused request are not shown', async () => {
  const { page, complaints, close } = await openWindow(browser);
  for (const name of ['client_id', 'redirect_uri', 'scope', 'state']) {
    await open(page, { ...album, id: 'unknown' }, { [name]: script });
    await heading(page, 'This does not work');
    assert.doesNotMatch(await page.content(), /alert\(1\)/);
  }
  assert.deepEqual(
    complaints.filter((text) => !/status of 400/.test(text)),
    [],
  );
  await close();
});

test('the policy stops injected scripts, styles, images and foreign forms', async () => {
  const { page, complaints, close } = await openWindow(browser);
  await open(page);
  await page.evaluate(() => {
    document.body.insertAdjacentHTML(
      'beforeend',
      '<img src="/style.css" onerror="document.title = 1"><p style="color:red">',
    );
    const script = document.createElement('script');
    script.textContent = 'document.title = "taken over"';
    document.body.append(script);
    document.forms[0].action = 'http://127.0.0.1:9/stolen';
  });
  assert.equal(await page.title(), 'Log in to continue to Photo album');
  const before = page.url();
  await page.getByLabel('Name').fill(alice.name);
  await page.getByLabel('Password').fill(alice.password);
  await button(page, 'Log in').click({ noWaitAfter: true }); // the policy blocks the form
  await page.waitForTimeout(500);
  assert.equal(page.url(), before);
  const blocked = complaints.map(
    (text) => /"?(script-src|style-src|img-src|default-src|form-action)/.exec(text)?.[1],
  );
  for (const directive of ['style-src', 'form-action', 'default-src'])
    assert.ok(blocked.includes(directive), `${directive}: ${complaints.join('\n')}`);
  assert.deepEqual(server.rows(), { codes: [], tokens: [] });
  await close();
});

test('no other site can show the pages in a frame', async () => {
  const { page, complaints, close } = await openWindow(browser);
  await page.goto(new URL('/frame', album.redirectUri).href);
  await page.waitForTimeout(500);
  assert.equal(await page.frameLocator('iframe').getByLabel('Password').count(), 0);
  assert.ok(
    complaints.some((text) => text.includes('frame-ancestors')),
    complaints.join('\n'),
  );
  await close();
});

test('no script can read the session', () =>
  inWindow({}, async (page) => {
    await open(page);
    await logIn(page);
    await heading(page, 'Allow Photo album?');
    assert.equal(await page.evaluate(() => document.cookie), '');
    const [cookie] = await page.context().cookies(server.issuer);
    assert.deepEqual([cookie.name, cookie.httpOnly, cookie.sameSite], ['authserver', true, 'Lax']);
  }));

test('screenshots of both pages stay small', async () => {
  for (const [suffix, options] of [
    ['', { viewport: { width: 720, height: 520 } }],
    ['-phone', { ...phone, deviceScaleFactor: 1 }],
  ])
    await inWindow(options, async (page) => {
      const shoot = async (name) => {
        const path = `${process.env.AUTHSERVER_SCREENSHOTS}/authserver-${name}${suffix}.png`;
        const picture = await page.screenshot({ path });
        assert.ok(picture.length < 60 * 1024, `${path}: ${picture.length} bytes`);
      };
      await open(page, remote);
      await shoot('login');
      await logIn(page);
      await heading(page, 'Allow Photo album?');
      await shoot('consent');
    });
});
