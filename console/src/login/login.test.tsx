import { fireEvent, render, screen, waitFor } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { afterEach, beforeEach, describe, expect, it, vi } from 'vitest';
import { FakeApi, later, Refusal } from '../../test/fakeApi';
import { connectionWorks } from '../api/connection';
import { session, sessionClosed, sessionEnded, sessionStarted } from '../api/session';
import { App } from '../app';

const info = { csrf: 'x', user: 'admin', idle_seconds: 900, expires: 2_000_000_000 };

let api: FakeApi;
const user = userEvent.setup();

beforeEach(() => {
  session.set({ state: 'unknown' });
  api = new FakeApi();
  api.install();
  api.on('/session', () => new Refusal(220, 401));
  api.on('domain.get', () => ({ enable_domain: false }));
  api.on('directory.domains', () => ({ domains: [] }));
  api.on('directory.overview', () => ({
    host_name: 'NAS1',
    computer_account: null,
    last_test: null,
    interfaces: [],
    refresh: null,
    busy: null,
  }));
});

afterEach(() => {
  connectionWorks();
  sessionClosed();
  vi.unstubAllGlobals();
});

async function logIn(name: string, password: string) {
  await user.type(await screen.findByRole('textbox', { name: 'User name' }), name);
  await user.type(screen.getByLabelText('Password'), password);
  await user.click(screen.getByRole('button', { name: 'Log in' }));
}

const heading = (name: string) => screen.findByRole('heading', { level: 1, name }, { timeout: 5000 });

describe('log-in', () => {
  it('leads to the view of the address', async () => {
    api.on('/session/login', () => info);
    window.location.hash = '#/join/no-such-view';
    render(<App />);
    await logIn('admin', 'secret');
    await heading('There is no such view');
    expect(api.of('/session/login').map((call) => call.parameters)).toEqual([
      { user: 'admin', password: 'secret' },
    ]);
  });

  it('says what is wrong, forgets the password and waits there for it', async () => {
    api.on('/session/login', () => new Refusal(222, 401));
    render(<App />);
    await logIn('admin', 'wrong');
    expect(await screen.findByText('Code 222')).toBeVisible();
    const field = screen.getByLabelText('Password');
    expect(field).toHaveValue('');
    expect(field).toHaveFocus();
    expect(screen.getByRole('textbox', { name: 'User name' })).toHaveValue('admin');
  });

  it('waits as long as the appliance says after too many attempts', async () => {
    api.on('/session/login', () => new Refusal(223, 429, { 'Retry-After': '4' }));
    render(<App />);
    await logIn('admin', 'wrong');
    expect(await screen.findByText(/^You can try again in \d seconds\.$/)).toBeVisible();
    expect(screen.getByRole('button', { name: 'Log in' })).toBeDisabled();
    const password = screen.getByLabelText('Password');
    fireEvent.change(password, { target: { value: 'right' } });
    fireEvent.submit(password);
    expect(api.of('/session/login')).toHaveLength(1);
    expect(await screen.findByText('You can try again now.', {}, { timeout: 8000 })).toBeVisible();
    expect(screen.getByRole('button', { name: 'Log in' })).toBeEnabled();
  });

  it('asks for what is missing without a call', async () => {
    render(<App />);
    await user.click(await screen.findByRole('button', { name: 'Log in' }));
    expect(screen.getByText('Enter your user name.')).toBeVisible();
    expect(screen.getByRole('textbox', { name: 'User name' })).toHaveFocus();
    expect(api.of('/session/login')).toHaveLength(0);
  });

  it('by a link works once, and the token leaves the address', async () => {
    const answer = later<typeof info>();
    api.on('/session/link', () => answer.promise);
    window.location.hash = '#/link/some-token';
    render(<App />);
    await waitFor(() => expect(api.of('/session/link')).toHaveLength(1));
    expect(window.location.hash).not.toContain('some-token');
    answer.resolve(info);
    await heading('Overview');
    expect(window.location.hash).toBe('#/overview');
    expect(api.of('/session/link').map((call) => call.parameters)).toEqual([{ token: 'some-token' }]);
  });

  it('by a link that was used says so', async () => {
    api.on('/session/link', () => new Refusal(224, 401));
    window.location.hash = '#/link/used-token';
    render(<App />);
    expect(await screen.findByText(/The one-time link did not log you in/)).toBeVisible();
    expect(window.location.hash).not.toContain('used-token');
  });

  it('is asked for when the session has ended, and leads back', async () => {
    api.on('/session/login', () => info);
    sessionStarted(info);
    window.location.hash = '#/overview';
    render(<App />);
    await heading('Overview');
    sessionEnded();
    expect(await screen.findByText(/Your session ended/)).toBeVisible();
    await logIn('admin', 'secret');
    await heading('Overview');
  });
});

describe('the start', () => {
  it('says that the appliance does not answer, and goes on by itself', async () => {
    let gone = true;
    api.on('/session', () => {
      if (gone) throw new TypeError('refused');
      return info;
    });
    render(<App />);
    expect(await screen.findByText('The appliance does not answer.')).toBeVisible();
    gone = false;
    await user.click(screen.getByRole('button', { name: 'Try now' }));
    await heading('Overview');
    await waitFor(() => expect(screen.getByText('The appliance answers again.')).toBeVisible());
  });
});
