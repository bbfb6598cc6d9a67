import { render, screen, waitFor, within } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { describe, expect, it } from 'vitest';
import type { DomainRow } from '../api/types';
import { imitate, Refusal } from '../rules/imitated';
import DomainsPage from './DomainsPage';
import { matching, shownList } from './rows';

const many = (count: number): DomainRow[] =>
  Array.from({ length: count }, (_unused, index) => {
    const name = index === 0 ? 'LAB' : `DOM${index}`;
    return [name, name, index % 2 === 0 ? `${name.toLowerCase()}.example.com` : ''];
  });

function show(rows: DomainRow[]) {
  const appliance = imitate({ 'domain.list': () => ({ domain_list: rows }) });
  render(<DomainsPage />);
  return appliance;
}

const bodyRows = () => screen.getAllByRole('row').slice(1);

describe('the list of domains', () => {
  it('shows names and DNS names, the own one first', async () => {
    show(many(3));
    const table = await screen.findByRole('table', { name: 'Domains' });
    const [own, other] = within(table).getAllByRole('row').slice(1);
    expect(own).toHaveTextContent('LAB Own domain');
    expect(own).toHaveTextContent('lab.example.com');
    expect(other).toHaveTextContent('DOM1');
    expect(other).toHaveTextContent('Unknown');
    expect(other).not.toHaveTextContent('Own domain');
    expect(screen.getByText('1 to 3 of 3 domains')).toBeInTheDocument();
  });

  it('draws a page of many, and turns the pages with the keyboard', async () => {
    show(many(5000));
    await screen.findByText('1 to 100 of 5,000 domains');
    expect(bodyRows()).toHaveLength(100);
    const user = userEvent.setup();
    await user.click(screen.getByRole('searchbox'));
    await user.keyboard('{PageDown}');
    expect(screen.getByText('101 to 200 of 5,000 domains')).toBeInTheDocument();
    expect(bodyRows()[0]).toHaveTextContent('DOM100');
    await user.keyboard('{PageUp}{PageUp}');
    expect(screen.getByText('1 to 100 of 5,000 domains')).toBeInTheDocument();
    await user.click(screen.getAllByRole('button', { name: 'Last page' })[0] as HTMLElement);
    expect(screen.getByText('4,901 to 5,000 of 5,000 domains')).toBeInTheDocument();
  });

  it('searches names and DNS names, whatever the case', async () => {
    const appliance = show(many(5000));
    await screen.findByText('1 to 100 of 5,000 domains');
    const user = userEvent.setup();
    await user.type(screen.getByRole('searchbox'), 'DOM4998.ex');
    expect(bodyRows()).toHaveLength(1);
    expect(screen.getByText('1 to 1 of 1 match, of 5,000 in all')).toBeInTheDocument();
    await user.type(screen.getByRole('searchbox'), '!');
    expect(screen.getByRole('heading', { name: 'Nothing matches' })).toBeInTheDocument();
    await user.click(screen.getByRole('button', { name: 'Clear the search' }));
    expect(bodyRows()).toHaveLength(100);
    expect(appliance.of('domain.list')).toHaveLength(1);
  });

  it('shows organisational units without trusted domains', async () => {
    show([
      ['--', '', 'LAB'],
      ['Sales', 'OU=Sales,DC=lab', 'OU=Sales,DC=lab'],
    ]);
    const table = await screen.findByRole('table', { name: 'Organisational units of LAB' });
    expect(within(table).getAllByRole('row')).toHaveLength(2);
    expect(within(table).getByText('OU=Sales,DC=lab')).toBeInTheDocument();
    expect(screen.queryByText('--')).not.toBeInTheDocument();
    expect(screen.queryByText('Own domain')).not.toBeInTheDocument();
  });

  it('says so when there are no units', async () => {
    show([['--', '', 'LAB']]);
    expect(await screen.findByRole('heading', { name: 'No organisational units' })).toBeInTheDocument();
  });

  it('leads an appliance in a workgroup to the join', async () => {
    show([]);
    const link = await screen.findByRole('link', { name: 'Join a domain' });
    expect(link).toHaveAttribute('href', '#/join');
  });

  it('tells a failure with its cause, and tries again', async () => {
    const appliance = imitate({ 'domain.list': () => new Refusal(2619) });
    render(<DomainsPage />);
    expect(await screen.findByRole('alert')).toHaveTextContent(
      'can’t be a member of a domain'.replace('’', "'"),
    );
    expect(screen.getByText('Code 2619')).toBeInTheDocument();
    appliance.handlers['domain.list'] = () => ({ domain_list: many(2) });
    await userEvent.click(screen.getByRole('button', { name: 'Try again' }));
    await screen.findByText('1 to 2 of 2 domains');
    expect(screen.queryByText('Code 2619')).not.toBeInTheDocument();
  });

  it('reloads', async () => {
    const appliance = show(many(2));
    await screen.findByText('1 to 2 of 2 domains');
    appliance.handlers['domain.list'] = () => ({ domain_list: many(3) });
    await userEvent.click(screen.getByRole('button', { name: 'Reload' }));
    await waitFor(() => expect(screen.getByText('1 to 3 of 3 domains')).toBeInTheDocument());
  });
});

describe('rows', () => {
  it('are told apart by the first one', () => {
    expect(shownList([]).kind).toBe('domains');
    expect(shownList([['LAB', 'LAB', '']]).rows).toHaveLength(1);
    expect(shownList([['--', '', 'LAB']])).toEqual({ kind: 'units', workgroup: 'LAB', rows: [] });
  });

  it('do not match across name and DNS name', () => {
    const { rows } = shownList([['LAB', 'LAB', 'lab.example.com']]);
    expect(matching(rows, 'lablab')).toHaveLength(0);
    expect(matching(rows, ' LAB.exa ')).toHaveLength(1);
  });
});
