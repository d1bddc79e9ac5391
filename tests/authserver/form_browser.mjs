// A small browser for pages without scripts: cookies, forms, redirects within the server.

import { parse } from 'parse5';

import { encoded, request } from './http.mjs';

export function* elements(node) {
  if (node.tagName) yield node;
  for (const child of node.childNodes ?? []) yield* elements(child);
}

export function attribute(element, name) {
  return element.attrs.find((candidate) => candidate.name === name)?.value;
}

export function textOf(node) {
  if (node.nodeName === '#text') return node.value;
  return (node.childNodes ?? []).map(textOf).join('').trim();
}

export class FormBrowser {
  #cookies = new Map();

  constructor(server) {
    this.origin = server.issuer;
  }

  async open(target, options = {}) {
    const url = new URL(target, this.origin);
    const cookie = [...this.#cookies].map(([name, value]) => `${name}=${value}`).join('; ');
    const answer = await request(url, {
      ...options,
      headers: { ...options.headers, ...(cookie && { cookie }) },
    });
    for (const header of answer.headers['set-cookie'] ?? []) {
      const [, name, value] = /^([^=]+)=([^;]*)/.exec(header);
      this.#cookies.set(name, value);
    }
    const location = answer.headers.location && new URL(answer.headers.location, url);
    if (location && location.origin === this.origin) return this.open(location);
    this.page = { ...answer, location, document: parse(answer.text) };
    return this.page;
  }

  // The fields of the page's form with the given changes; undefined removes a field.
  fields(changes = {}) {
    const form = [...elements(this.page.document)].find((element) => element.tagName === 'form');
    const inputs = [...elements(form)].filter((element) => element.tagName === 'input');
    const own = Object.fromEntries(
      inputs.map((input) => [attribute(input, 'name'), attribute(input, 'value') ?? '']),
    );
    return { ...own, ...changes };
  }

  // Presses the button with that label.
  submit(label, changes = {}) {
    const all = [...elements(this.page.document)];
    const form = all.find((element) => element.tagName === 'form');
    const button = all.find(
      (element) => element.tagName === 'button' && textOf(element).includes(label),
    );
    if (!button) throw new Error(`no button "${label}" in: ${this.page.text}`);
    const pressed = { [attribute(button, 'name')]: attribute(button, 'value') };
    return this.post(attribute(form, 'action'), { ...this.fields(), ...pressed, ...changes });
  }

  post(target, parameters) {
    return this.open(target, {
      method: 'POST',
      headers: { 'content-type': 'application/x-www-form-urlencoded' },
      body: encoded(parameters),
    });
  }

  forgetCookies() {
    this.#cookies.clear();
  }
}
