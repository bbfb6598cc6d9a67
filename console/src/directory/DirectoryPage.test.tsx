import { act, render, screen, waitFor, within } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { afterEach, beforeEach, describe, expect, it } from 'vitest';
import type { DirectoryList, RefreshProgress } from '../api/types';
import { imitate, kMember, later, Refusal, type Handlers } from '../rules/imitated';
import DirectoryPage from './DirectoryPage';

const kNow = Math.floor(Date.now() / 1000);
const kTotal = 100_000;
let progress: RefreshProgress | null;
let task: 'updating' | 'finish' | number;

const running = (more: Partial<RefreshProgress> = {}): RefreshProgress => ({
  running: true,
  kind: 'user',
  domain: 'LAB',
  count: 2000,
  domains_done: 0,
  domains: 2,
  started: Math.floor(Date.now() / 1000),
  updated: Math.floor(Date.now() / 1000),
  errors: [],
  ...more,
});

function list({ domain = 'LAB', offset = 0, limit = 100, search = '' }): DirectoryList {
  const total = search === '' ? kTotal : 1;
  const entries = Array.from(
    { length: Math.max(0, Math.min(3, limit, total - offset)) },
    (_unused, index) => ({
      name: search === '' ? `user${offset + index}` : `found ${search}`,
      id: 1_000_000 + offset + index,
      display: 'Anna Berg',
    }),
  );
  return { total, offset, domain, fetched: kNow - 300, entries };
}

function show(more: Handlers = {}) {
  const appliance = imitate({
    'domain.get': () => kMember,
    'domain.names': () => ({ domain_list: ['LAB', 'THIRD'] }),
    'directory.domains': () => ({ domains: [{ domain: 'OTHER', kind: 'user', count: 1, fetched: kNow }] }),
    'directory.users': (parameters) => list(parameters),
    'directory.refresh_progress': () => progress,
    'domain.update_start': () => ({ task_id: 'DomainUpdate_1' }),
    'domain.update_status': () => (typeof task === 'number' ? new Refusal(task) : { status: task }),
    'domain.update_stop': () => null,
    ...more,
  });
  render(<DirectoryPage kind="user" />);
  return appliance;
}

const searches = (appliance: ReturnType<typeof show>) =>
  appliance.of('directory.users').map((call) => call.parameters['search']);
const pause = (milliseconds: number) =>
  act(() => new Promise((resolve) => setTimeout(resolve, milliseconds)));

beforeEach(() => {
  progress = null;
  task = 'updating';
});
afterEach(() => window.sessionStorage.clear());

describe('the list', () => {
  it('shows a page, the total and its age', async () => {
    show();
    expect(await screen.findByText('1 to 3 of 100,000 users')).toBeInTheDocument();
    expect(
      within(screen.getByRole('table', { name: 'Users of LAB' })).getByText('user0'),
    ).toBeInTheDocument();
    const age = screen.getByText('5 minutes ago', { selector: 'time' });
    expect(age).toHaveAttribute('title', expect.stringMatching(/202\d/));
  });

  it('searches once when the typing rests', async () => {
    const appliance = show();
    await screen.findByText('user0');
    await userEvent.type(screen.getByRole('searchbox'), 'anna');
    expect(await screen.findByText('found anna')).toBeInTheDocument();
    expect(searches(appliance)).toEqual(['', 'anna']);
    expect(screen.getByText('1 to 1 of 1 match')).toBeInTheDocument();
  });

  it('passes over the late answer of an older search', async () => {
    const appliance = show();
    await screen.findByText('user0');
    const slow = later<DirectoryList>();
    appliance.handlers['directory.users'] = (parameters) =>
      parameters.search === 'a' ? slow.promise : list(parameters);
    await userEvent.type(screen.getByRole('searchbox'), 'a');
    await waitFor(() => expect(searches(appliance)).toContain('a'));
    await userEvent.type(screen.getByRole('searchbox'), 'b');
    await screen.findByText('found ab');
    slow.give(list({ search: 'a' }));
    await pause(50);
    expect(screen.getByText('found ab')).toBeInTheDocument();
    expect(screen.queryByText('found a')).not.toBeInTheDocument();
  });

  it('turns pages on the appliance, by the keyboard too', async () => {
    const appliance = show();
    await screen.findByText('user0');
    await userEvent.click(screen.getByRole('searchbox'));
    await userEvent.keyboard('{PageDown}');
    expect(await screen.findByText('user100')).toBeInTheDocument();
    await userEvent.click(screen.getByRole('button', { name: 'Last page' }));
    expect(await screen.findByText('user99900')).toBeInTheDocument();
    expect(appliance.of('directory.users').map((call) => call.parameters['offset'])).toEqual([0, 100, 99900]);
  });

  it('refuses a search that the appliance would refuse', async () => {
    const appliance = show();
    await screen.findByText('user0');
    await userEvent.click(screen.getByRole('searchbox'));
    await userEvent.paste('ä'.repeat(129));
    expect(screen.getByText(/at most 256 bytes/)).toBeInTheDocument();
    await pause(300);
    expect(searches(appliance)).toEqual(['']);
    await userEvent.clear(screen.getByRole('searchbox'));
    await userEvent.paste('an\tna');
    expect(await screen.findByText('found an na')).toBeInTheDocument();
  });

  it('offers the own, the listed and the trusted domains', async () => {
    const appliance = show();
    await screen.findByRole('option', { name: 'THIRD' });
    const names = screen.getAllByRole('option').map((option) => option.textContent);
    expect(names).toEqual(['LAB (own domain)', 'OTHER', 'THIRD']);
    appliance.handlers['directory.users'] = () => ({
      total: 0,
      offset: 0,
      domain: 'THIRD',
      fetched: null,
      entries: [],
    });
    await userEvent.selectOptions(screen.getByRole('combobox', { name: 'Domain' }), 'THIRD');
    expect(await screen.findByText('The users of THIRD have not been fetched yet')).toBeInTheDocument();
  });

  it('is not there without a membership', async () => {
    imitate({ 'domain.get': () => ({ enable_domain: false }), 'directory.domains': () => ({ domains: [] }) });
    render(<DirectoryPage kind="group" />);
    expect(await screen.findByRole('link', { name: 'Join a domain' })).toBeInTheDocument();
  });
});

describe('a refresh', () => {
  const start = async (name = 'Refresh all domains') =>
    userEvent.click(await screen.findByRole('button', { name }));

  it('is followed to its end, by calls in the background, and renews the list', async () => {
    const appliance = show();
    await screen.findByText('user0');
    await start();
    progress = running();
    await screen.findByRole('button', { name: 'Stop the refresh' });
    expect(await screen.findByText('2,000 users so far', {}, { timeout: 3000 })).toBeInTheDocument();
    expect(screen.getByText('Domain 1 of 2')).toBeInTheDocument();
    progress = running({ kind: 'group', domains_done: 1, domain: 'OTHER', count: 7 });
    expect(await screen.findByText('7 groups so far', {}, { timeout: 3000 })).toBeInTheDocument();
    expect(screen.getByRole('progressbar')).toHaveAttribute('aria-valuetext', '3 of 4 lists');
    const before = appliance.of('directory.users').length;
    task = 'finish';
    progress = { ...running({ kind: 'group', domains_done: 2 }), running: false };
    expect(await screen.findByText('The refresh is done.', {}, { timeout: 3000 })).toBeInTheDocument();
    await waitFor(() => expect(appliance.of('directory.users').length).toBeGreaterThan(before));
    for (const method of ['directory.refresh_progress', 'domain.update_status'] as const) {
      expect(appliance.of(method).every((call) => call.background)).toBe(true);
    }
    expect(appliance.of('domain.update_start').map((call) => call.parameters)).toEqual([{}]);
  });

  it('of one domain names it', async () => {
    const appliance = show();
    await start('Refresh LAB');
    await screen.findByRole('button', { name: 'Stop the refresh' });
    expect(appliance.of('domain.update_start').map((call) => call.parameters)).toEqual([
      { domain_name: 'LAB' },
    ]);
  });

  it('of a foreign domain is not offered without trusted domains', async () => {
    const appliance = show({ 'domain.get': () => ({ ...kMember, manage_mode: 1 }) });
    await screen.findByRole('option', { name: 'OTHER' });
    await userEvent.selectOptions(screen.getByRole('combobox', { name: 'Domain' }), 'OTHER');
    expect(screen.getByText(/only the own domain can be refreshed/)).toBeInTheDocument();
    await start('Refresh OTHER');
    expect(appliance.of('domain.update_start')).toHaveLength(0);
    expect(appliance.of('domain.names')).toHaveLength(0);
  });

  it('that fails tells its code and what failed where', async () => {
    show();
    await start();
    progress = running({ errors: [{ domain: 'OTHER', kind: 'user', reason: 'no controller answers' }] });
    await screen.findByText(/1 list could not be fetched/, {}, { timeout: 3000 });
    task = 2623;
    progress = { ...running({ kind: 'group' }), running: false };
    expect(await screen.findByText('Code 2623', {}, { timeout: 3000 })).toBeInTheDocument();
    await userEvent.click(screen.getByRole('button', { name: 'Details' }));
    expect(screen.getByText(/no controller answers/)).toBeInTheDocument();
  });

  it('that another runs already is shown instead of an error', async () => {
    const appliance = show();
    await screen.findByText('user0');
    appliance.handlers['domain.update_start'] = () => {
      progress = running();
      return new Refusal(2626);
    };
    await start();
    expect(await screen.findByText('A refresh is running already')).toBeInTheDocument();
    expect(await screen.findByRole('button', { name: 'Stop the refresh' })).toBeInTheDocument();
    expect(screen.queryByText('Code 2626')).not.toBeInTheDocument();
  });

  it('that another started is seen by itself', async () => {
    show();
    await screen.findByText('user0');
    progress = running();
    expect(
      await screen.findByRole('button', { name: 'Stop the refresh' }, { timeout: 5000 }),
    ).toBeInTheDocument();
  });

  it('is stopped, and it is said what that means', async () => {
    const appliance = show();
    await start();
    progress = running();
    appliance.handlers['domain.update_stop'] = () => {
      task = 121;
      progress = { ...running(), running: false };
      return null;
    };
    await userEvent.click(await screen.findByRole('button', { name: 'Stop the refresh' }));
    expect(await screen.findByText('The refresh was stopped', {}, { timeout: 3000 })).toBeInTheDocument();
    expect(screen.getByText(/as they were before/)).toBeInTheDocument();
    expect(screen.queryByText('Code 121')).not.toBeInTheDocument();
    expect(await screen.findByRole('button', { name: 'Refresh all domains' })).toBeInTheDocument();
  });

  it('of the appliance itself goes on, and that is said', async () => {
    progress = running();
    show();
    await userEvent.click(await screen.findByRole('button', { name: 'Stop the refresh' }));
    expect(await screen.findByText('The refresh goes on', {}, { timeout: 9000 })).toBeInTheDocument();
  });

  it('is followed on after a reload of the page', async () => {
    window.sessionStorage.setItem('vorn-refresh', 'DomainUpdate_1');
    task = 2623;
    show();
    await screen.findByText('user0');
    // It ended while nobody looked.
    expect(await screen.findByText('Code 2623', {}, { timeout: 3000 })).toBeInTheDocument();
  });

  it('that ended before is told with its age and its errors', async () => {
    const now = Math.floor(Date.now() / 1000);
    progress = {
      ...running({
        started: now - 700,
        updated: now - 600,
        errors: [{ domain: 'OTHER', kind: 'user', reason: 'x' }],
      }),
      running: false,
    };
    show();
    expect(await screen.findByText('10 minutes ago', { selector: 'time' })).toBeInTheDocument();
    expect(screen.getByText('1 list could not be fetched')).toBeInTheDocument();
  });
});
