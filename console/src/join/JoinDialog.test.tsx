import { act, render, screen, waitFor, within } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { afterEach, beforeEach, describe, expect, it, vi } from 'vitest';
import { FakeApi, later, Refusal } from '../../test/fakeApi';
import { connectionWorks } from '../api/connection';
import { sessionClosed, sessionStarted } from '../api/session';
import type { DomainState, JoinSteps } from '../api/types';
import { job, startJoin } from './job';
import { JoinDialog } from './JoinDialog';
import { emptyForm } from './rules';

const interfaces = [
  { name: 'eth0', addresses: ['10.0.0.5'] },
  { name: 'eth1', addresses: [] },
];

const member: DomainState = {
  enable_domain: true,
  domain_name: 'LAB',
  domain_type: 'AD',
  manage_mode: 1,
  dns: '10.0.0.1,10.0.0.2',
  advance_domain_conf: {
    enable_advance_option: true,
    kdc: '10.0.0.1',
    netbios_name: 'LAB',
    fqdn_name: 'LAB.EXAMPLE.COM',
    register_nics: ['eth0', 'eth7'],
  },
};

function record(change: Partial<JoinSteps>): JoinSteps {
  return {
    id: 'this',
    action: 'join',
    domain: 'lab.example.com',
    started: 1,
    finished: null,
    success: null,
    message: '',
    steps: [{ name: 'discover', server: 'dc1', outcome: 'running', detail: '', milliseconds: 0 }],
    leftovers: [],
    ...change,
  };
}

let api: FakeApi;
const closed = vi.fn();
const user = userEvent.setup();

beforeEach(() => {
  sessionStarted({ csrf: 'x', user: 'admin', idle_seconds: 900, expires: 2_000_000_000 });
  api = new FakeApi();
  api.install();
  api.on('directory.join_steps', () => null);
  closed.mockReset();
});

afterEach(() => {
  connectionWorks();
  sessionClosed();
  job.set({ state: 'idle' });
  vi.unstubAllGlobals();
});

function open(domain: Parameters<typeof JoinDialog>[0]['domain'] = { enable_domain: false }) {
  return render(<JoinDialog domain={domain} interfaces={interfaces} onClose={closed} />);
}

const field = (name: string) => screen.getByRole('textbox', { name });
const password = () => screen.getByLabelText(/^Password/);
const button = (name: string) => screen.getByRole('button', { name });

async function fillIn() {
  await user.type(field('Domain'), 'lab.example.com');
  await user.type(field('Account'), 'Administrator');
  await user.type(password(), 'secret');
}

describe('the join dialog', () => {
  it('refuses what the appliance would refuse, and goes to the first field that needs a correction', async () => {
    open();
    await user.type(field('Domain'), '10.0.0.1');
    await user.click(button('Join'));
    expect(screen.getByText(/^This is an address/)).toBeVisible();
    expect(screen.getByText('Enter the account that joins.')).toBeVisible();
    expect(screen.getByText('3 fields need a correction.')).toBeVisible();
    await waitFor(() => expect(field('Domain')).toHaveFocus());
    expect(field('Domain')).toBeInvalid();
    expect(api.of('domain.set')).toHaveLength(0);
  });

  it('complains about a field only after a pause', async () => {
    open();
    await user.type(field('Domain'), '10.0.0.1');
    expect(screen.queryByText(/^This is an address/)).not.toBeInTheDocument();
    await screen.findByText(/^This is an address/);
    await user.type(field('Domain'), 'a');
    expect(screen.queryByText(/^This is an address/)).not.toBeInTheDocument();
  });

  it('sends all that was entered, once, and shows the steps while the join runs', async () => {
    const answer = later<null>();
    let now: JoinSteps | null = null;
    api.on('directory.join_steps', () => now);
    api.on('domain.set', () => {
      now = record({});
      return answer.promise;
    });
    open();
    await fillIn();
    await user.type(field('DNS servers'), '10.0.0.1, 10.0.0.2');
    await user.click(screen.getByRole('switch', { name: 'Use trusted domains' }));
    await user.click(button('Advanced options'));
    await user.type(field('Domain controller (KDC)'), 'dc1.lab.example.com');
    await user.click(screen.getByRole('radio', { name: 'Only those of' }));
    await user.click(screen.getByRole('checkbox', { name: 'eth1' }));
    await user.dblClick(button('Join'));

    const list = await screen.findByRole('list', { name: 'Steps' });
    expect(list).toHaveTextContent('Find a domain controller');
    expect(screen.getByText('Step 1: Find a domain controller')).toHaveAttribute('role', 'status');
    expect(api.of('domain.set').map((call) => call.parameters)).toEqual([
      {
        enable_domain: true,
        domain_name: 'lab.example.com',
        username: 'Administrator',
        password: 'secret',
        dns: '10.0.0.1,10.0.0.2',
        manage_mode: 1,
        advance_domain_conf: {
          enable_advance_option: true,
          kdc: 'dc1.lab.example.com',
          netbios_name: '',
          fqdn_name: '',
          register_nics: ['eth1'],
        },
      },
    ]);
    answer.resolve(null);
    expect(await screen.findByText('The appliance is a member of lab.example.com.')).toBeVisible();
    expect(api.of('domain.set')).toHaveLength(1);
  });

  it('does not show the steps of an earlier join as those of this one', async () => {
    api.on('directory.join_steps', () => record({ id: 'earlier', finished: 2, success: true }));
    api.on('domain.set', () => later().promise);
    open();
    await fillIn();
    await user.click(button('Join'));
    await waitFor(() => expect(api.of('directory.join_steps').length).toBeGreaterThan(1));
    expect(screen.getByText('The join is starting…')).toBeInTheDocument();
    expect(screen.queryByRole('list', { name: 'Steps' })).not.toBeInTheDocument();
  });

  it('explains a failure, keeps the values but the password, and can be used again', async () => {
    const records = [null];
    api.on('directory.join_steps', () =>
      records.length > 0
        ? records.shift()
        : record({
            finished: 2,
            success: false,
            steps: [
              {
                name: 'credentials',
                server: 'dc1',
                outcome: 'failed',
                detail: 'kinit said no',
                milliseconds: 5,
              },
            ],
            leftovers: ['the computer account NAS1$ may have been created in LAB'],
          }),
    );
    api.on('domain.set', () => new Refusal(2607));
    open();
    await fillIn();
    await user.click(button('Join'));

    await screen.findByText('Code 2607');
    const alert = screen.getByText('Code 2607').closest('[role=alert]');
    expect(alert).toHaveTextContent('The join failed. The account or its password is wrong.');
    expect(screen.getByText(/may have been created/)).toBeVisible();
    await user.click(button('Details'));
    expect(screen.getByText('kinit said no')).toBeVisible();
    expect(field('Domain')).toHaveValue('lab.example.com');
    expect(field('Account')).toHaveValue('Administrator');
    expect(password()).toHaveValue('');
    expect(JSON.stringify(job.get())).not.toContain('secret');

    api.on('domain.set', () => null);
    await user.type(password(), 'right');
    await user.click(button('Try again'));
    await screen.findByText('The appliance is a member of lab.example.com.');
    expect(api.of('domain.set').map((call) => call.parameters.password)).toEqual(['secret', 'right']);
  });

  it('does not blame the steps of an earlier join for a refusal', async () => {
    const leftovers = ['something of the earlier one'];
    api.on('directory.join_steps', () => record({ id: 'earlier', finished: 2, success: false, leftovers }));
    api.on('domain.set', () => new Refusal(2620));
    open();
    await fillIn();
    await user.click(button('Join'));
    await screen.findByText('Code 2620');
    expect(screen.queryByRole('button', { name: 'Details' })).not.toBeInTheDocument();
    expect(screen.queryByText(leftovers[0] ?? '')).not.toBeInTheDocument();
  });

  it('can be closed while the join runs, which goes on', async () => {
    const answer = later<null>();
    api.on('domain.set', () => answer.promise);
    const view = open();
    await fillIn();
    await user.click(button('Join'));
    await user.click(await screen.findByRole('button', { name: 'Close, the join goes on' }));
    expect(closed).toHaveBeenCalledOnce();
    view.unmount();
    expect(job.get().state).toBe('running');
    await act(async () => answer.resolve(null));
    await waitFor(() => expect(job.get()).toMatchObject({ state: 'done', domain: 'lab.example.com' }));
  });

  it('learns the end from the record when the answer is cut off', async () => {
    let now: JoinSteps | null = null;
    api.on('directory.join_steps', () => now);
    api.on('directory.overview', () => ({ busy: 'join' }));
    // What the page asks while the connection is lost.
    api.on('/session', () => ({ csrf: 'x', user: 'admin', idle_seconds: 900, expires: 2_000_000_000 }));
    api.on('domain.set', () => {
      now = record({});
      throw new TypeError('the connection broke');
    });
    open();
    await fillIn();
    await user.click(button('Join'));
    await screen.findByText(/The answer was cut off/);
    now = record({ finished: 3, success: false, message: 'Invalid KDC ip.' });
    await waitFor(() => expect(screen.getByText('The join failed: Invalid KDC ip.')).toBeVisible(), {
      timeout: 6000,
    });
    expect(api.of('domain.set')).toHaveLength(1);
  });

  it('is called the same before and after the join', async () => {
    api.on('domain.set', () => null);
    const view = open();
    await fillIn();
    await user.click(button('Join'));
    await screen.findByText('The appliance is a member of lab.example.com.');
    view.rerender(<JoinDialog domain={member} interfaces={interfaces} onClose={closed} />);
    expect(screen.getByRole('dialog', { name: 'Join a domain' })).toBeVisible();
  });

  it('begins no second join beside one that runs', async () => {
    api.on('domain.set', () => null);
    const form = { ...emptyForm, domain: 'LAB', user: 'a', password: 'b' };
    await Promise.all([startJoin(form), startJoin(form)]);
    expect(api.of('domain.set')).toHaveLength(1);
  });

  it('starts with what the membership was joined with', () => {
    open(member);
    expect(field('Domain')).toHaveValue('lab.example.com');
    expect(field('DNS servers')).toHaveValue('10.0.0.1, 10.0.0.2');
    expect(screen.getByRole('switch')).not.toBeChecked();
    expect(field('Domain controller (KDC)')).toHaveValue('10.0.0.1');
    const group = screen.getByRole('radiogroup');
    expect(
      within(group)
        .getAllByRole('checkbox')
        .map((box) => [box.id, (box as HTMLInputElement).checked]),
    ).toEqual([
      ['join-nic-eth0', true],
      ['join-nic-eth1', false],
      ['join-nic-eth7', true],
    ]);
  });
});
