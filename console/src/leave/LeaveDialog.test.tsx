import { render, screen } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { afterEach, beforeEach, describe, expect, it, vi } from 'vitest';
import { FakeApi, Refusal } from '../../test/fakeApi';
import { sessionClosed, sessionStarted } from '../api/session';
import { job } from '../join/job';
import { LeaveDialog } from './LeaveDialog';

let api: FakeApi;
const user = userEvent.setup();

beforeEach(() => {
  sessionStarted({ csrf: 'x', user: 'admin', idle_seconds: 900, expires: 2_000_000_000 });
  api = new FakeApi();
  api.install();
  api.on('directory.join_steps', () => null);
  api.on('directory.leave', () => null);
  render(<LeaveDialog domain="LAB" account="NAS1$" onClose={() => undefined} />);
});

afterEach(() => {
  sessionClosed();
  job.set({ state: 'idle' });
  vi.unstubAllGlobals();
});

const leave = () => screen.getByRole('button', { name: 'Leave domain' });
const confirm = () => screen.getByRole('textbox', { name: 'Type LAB to confirm' });

describe('the leave dialog', () => {
  it('does nothing before the name of the domain has been typed', async () => {
    expect(leave()).toBeDisabled();
    await user.type(confirm(), 'LA{Enter}');
    expect(leave()).toBeDisabled();
    expect(api.of('directory.leave')).toHaveLength(0);
    await user.type(confirm(), 'B');
    expect(leave()).toBeEnabled();
  });

  it('leaves, and names the account that stays behind', async () => {
    expect(screen.getByText(/The computer account NAS1\$ stays/)).toBeVisible();
    await user.type(confirm(), 'lab');
    await user.dblClick(leave());
    expect(await screen.findByText('The appliance left LAB.')).toBeVisible();
    expect(screen.getByText(/NAS1\$ is still in the domain/)).toBeVisible();
    expect(api.of('directory.leave').map((call) => call.parameters)).toEqual([{ delete_account: false }]);
  });

  it.each([
    [['the computer account NAS1$ stays in the domain LAB'], /NAS1\$ is still in the domain/],
    [[], 'The domain did not know the computer account NAS1$ any more.'],
  ])('says what the record says of the account: %j', async (leftovers, text) => {
    const record = { id: 'now', action: 'leave', domain: 'LAB', started: 1, finished: 2, success: true };
    let left = false;
    api.on('directory.leave', () => {
      left = true;
      return null;
    });
    api.on('directory.join_steps', () => (left ? { ...record, message: '', steps: [], leftovers } : null));
    await user.type(confirm(), 'LAB');
    await user.click(leave());
    expect(await screen.findByText(text)).toBeVisible();
  });

  it('deletes the account with the credentials of one who may', async () => {
    await user.click(screen.getByRole('checkbox', { name: /Delete the computer account NAS1\$/ }));
    await user.type(confirm(), 'LAB');
    await user.click(leave());
    expect(screen.getByText('Enter the account that joins.')).toBeVisible();
    expect(api.of('directory.leave')).toHaveLength(0);
    await user.type(screen.getByRole('textbox', { name: 'Account' }), 'Administrator');
    await user.type(screen.getByLabelText(/^Password/), 'secret');
    await user.click(leave());
    expect(
      await screen.findByText('The computer account NAS1$ was deleted on the domain controller.'),
    ).toBeVisible();
    expect(api.of('directory.leave').map((call) => call.parameters)).toEqual([
      { delete_account: true, username: 'Administrator', password: 'secret' },
    ]);
  });

  it('explains a refusal and stays usable', async () => {
    api.on('directory.leave', () => new Refusal(2611));
    await user.type(confirm(), 'LAB');
    await user.click(leave());
    expect(await screen.findByText('Code 2611')).toBeVisible();
    expect(leave()).toBeEnabled();
  });
});
