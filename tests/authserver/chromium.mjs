// Debian's Chromium, with a record of everything that a page reports.

import { chromium } from 'playwright-core';

export function launch() {
  return chromium.launch({
    executablePath: '/usr/bin/chromium',
    args: [
      '--no-sandbox', // the sandbox does not work for root
      '--disable-background-networking',
      '--disable-component-update',
      '--disable-sync',
      '--no-first-run',
      '--disable-gpu',
      '--disable-quic',
      '--disable-dev-shm-usage',
    ],
  });
}

// Opens a new window; complaints collects console messages, script errors and dialogs.
export async function openWindow(browser, options = {}) {
  const context = await browser.newContext({ viewport: { width: 900, height: 640 }, ...options });
  const page = await context.newPage();
  page.setDefaultTimeout(15000);
  const complaints = [];
  page.on('console', (message) => complaints.push(`${message.type()}: ${message.text()}`));
  page.on('pageerror', (error) => complaints.push(`error: ${error.message}`));
  page.on('dialog', (dialog) => {
    complaints.push(`dialog: ${dialog.message()}`);
    dialog.dismiss();
  });
  return { page, complaints, close: () => context.close() };
}
